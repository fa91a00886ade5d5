// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// Refers to the work queue without keeping it alive. A platform service answers on a thread of its own, at
// any time, perhaps when the queue is gone. The handler that a service is given therefore holds a
// WeakQueueRef and reaches the queue through it.
//
// Any thread.
class WeakQueueRef {
 public:
  explicit WeakQueueRef(SerialQueue& queue) : queue_(&queue) {}
  WeakQueueRef(const WeakQueueRef&) = delete;
  WeakQueueRef& operator=(const WeakQueueRef&) = delete;

  // Runs `work` on the queue. Called from the queue's own work, it runs `work` before it returns, else later.
  // Returns false, and does not run `work`, once close() has been called. Never waits for the queue.
  [[nodiscard]] bool run(Task work);

  // From now on run() runs nothing. Must be called before the queue ends.
  void close();

 private:
  Mutex mutex_;
  SerialQueue* queue_ GUARDED_BY(mutex_);  // null once closed
};

}  // namespace tonewerk
