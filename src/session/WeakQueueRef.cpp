// SPDX-License-Identifier: Apache-2.0
#include "session/WeakQueueRef.h"

#include <utility>

namespace tonewerk {

bool WeakQueueRef::run(Task work) {
  {
    const MutexLock lock(mutex_);
    if (queue_ == nullptr) return false;
    if (!queue_->isCurrent()) {
      queue_->async(std::move(work));
      return true;
    }
  }
  // Runs without the lock, because the work may call run() again. The queue does not end while its own work
  // runs.
  work();
  return true;
}

void WeakQueueRef::close() {
  const MutexLock lock(mutex_);
  queue_ = nullptr;
}

}  // namespace tonewerk
