// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryIssueDraftService.h"

#include <utility>

namespace tonewerk {

void MemoryIssueDraftService::createDraft(TrackletDraft draft, std::optional<std::string> processName,
                                          std::string displayReason, CompletionHandler completionHandler) {
  const MutexLock lock(mutex_);
  requests_.push_back({std::move(draft), std::move(processName), std::move(displayReason)});
  waiting_.push_back(std::move(completionHandler));
}

std::vector<MemoryIssueDraftService::Request> MemoryIssueDraftService::requests() const {
  const MutexLock lock(mutex_);
  return requests_;
}

std::size_t MemoryIssueDraftService::unanswered() const {
  const MutexLock lock(mutex_);
  return waiting_.size();
}

bool MemoryIssueDraftService::answerNext(const std::optional<std::string>& error) {
  CompletionHandler handler;
  {
    const MutexLock lock(mutex_);
    if (waiting_.empty()) return false;
    handler = std::move(waiting_.front());
    waiting_.pop_front();
  }
  handler(error);
  return true;
}

}  // namespace tonewerk
