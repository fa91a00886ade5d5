// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualSerialQueue.h"

#include <cassert>
#include <utility>

namespace tonewerk {

ManualSerialQueue::~ManualSerialQueue() {
  runAll();
  if (onDestruction_) onDestruction_();
}

void ManualSerialQueue::async(Task work) {
  const MutexLock lock(mutex_);
  pending_.push_back(std::move(work));
}

bool ManualSerialQueue::tryLend() {
  assert(!isCurrent());
  if (!mayLend_ || pendingCount() > 0) return false;
  runner_ = std::this_thread::get_id();
  return true;
}

std::size_t ManualSerialQueue::runAll() {
  assert(!isCurrent());
  std::size_t count = 0;
  for (;;) {
    std::vector<Task> batch;
    {
      const MutexLock lock(mutex_);
      batch.swap(pending_);
    }
    if (batch.empty()) return count;
    runner_ = std::this_thread::get_id();
    for (Task& work : batch) {
      work();
      work = nullptr;  // destroyed on the queue, before the next piece runs
    }
    runner_ = std::thread::id();
    count += batch.size();
  }
}

std::size_t ManualSerialQueue::pendingCount() const {
  const MutexLock lock(mutex_);
  return pending_.size();
}

}  // namespace tonewerk
