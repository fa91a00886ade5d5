// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryWhirlcapRequest.h"

#include <utility>

namespace tonewerk {

void MemoryWhirlcapRequest::request(std::string requester, std::string reason, std::string description,
                                    ValueMap payload, Flags flags) {
  std::function<void()> observer;
  {
    const MutexLock lock(mutex_);
    requests_.push_back(
        {std::move(requester), std::move(reason), std::move(description), std::move(payload), flags});
    observer = observer_;
  }
  if (observer) observer();
}

std::vector<MemoryWhirlcapRequest::Request> MemoryWhirlcapRequest::requests() const {
  const MutexLock lock(mutex_);
  return requests_;
}

void MemoryWhirlcapRequest::onRequest(std::function<void()> observer) {
  const MutexLock lock(mutex_);
  observer_ = std::move(observer);
}

}  // namespace tonewerk
