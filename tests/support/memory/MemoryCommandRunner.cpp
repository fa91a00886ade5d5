// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryCommandRunner.h"

#include <utility>

namespace tonewerk {

CommandRunner::Result MemoryCommandRunner::run(const std::string& command, const Limits& limits) {
  constexpr int kNoSuchCommand = 127;
  MutexLock lock(mutex_);
  runs_.push_back({command, limits});
  changed_.notifyAll();
  while (held_.contains(command)) changed_.wait(lock);
  const auto found = answers_.find(command);
  return found == answers_.end() ? Result{{}, End::kNotStarted, kNoSuchCommand} : found->second;
}

void MemoryCommandRunner::answer(const std::string& command, Result result) {
  const MutexLock lock(mutex_);
  answers_[command] = std::move(result);
}

void MemoryCommandRunner::hold(const std::string& command) {
  const MutexLock lock(mutex_);
  held_.insert(command);
}

void MemoryCommandRunner::release(const std::string& command) {
  const MutexLock lock(mutex_);
  held_.erase(command);
  changed_.notifyAll();
}

std::vector<MemoryCommandRunner::Run> MemoryCommandRunner::runs() const {
  const MutexLock lock(mutex_);
  return runs_;
}

void MemoryCommandRunner::waitForRuns(std::size_t count) {
  MutexLock lock(mutex_);
  while (runs_.size() < count) changed_.wait(lock);
}

}  // namespace tonewerk
