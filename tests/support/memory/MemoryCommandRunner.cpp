// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryCommandRunner.h"

#include <utility>

namespace tonewerk {

CommandRunner::Result MemoryCommandRunner::run(const std::string& command, const Limits& limits) {
  constexpr int kNoSuchCommand = 127;
  std::unique_lock lock(mutex_);
  runs_.push_back({command, limits});
  changed_.notify_all();
  changed_.wait(lock, [&] { return !held_.contains(command); });
  const auto found = answers_.find(command);
  return found == answers_.end() ? Result{{}, End::kNotStarted, kNoSuchCommand} : found->second;
}

void MemoryCommandRunner::answer(const std::string& command, Result result) {
  const std::lock_guard lock(mutex_);
  answers_[command] = std::move(result);
}

void MemoryCommandRunner::hold(const std::string& command) {
  const std::lock_guard lock(mutex_);
  held_.insert(command);
}

void MemoryCommandRunner::release(const std::string& command) {
  const std::lock_guard lock(mutex_);
  held_.erase(command);
  changed_.notify_all();
}

std::vector<MemoryCommandRunner::Run> MemoryCommandRunner::runs() const {
  const std::lock_guard lock(mutex_);
  return runs_;
}

void MemoryCommandRunner::awaitRuns(std::size_t count) {
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [&] { return runs_.size() >= count; });
}

}  // namespace tonewerk
