// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// The way onto the work queue for a platform service's answer, which comes on a thread of the service's and
// when the service likes: perhaps when the queue is gone. Whoever gives a service a handler lets it hold the
// gate.
//
// Any thread. Lives as long as somebody holds it.
class WeakQueueRef {
 public:
  explicit WeakQueueRef(SerialQueue& queue) : queue_(&queue) {}
  WeakQueueRef(const WeakQueueRef&) = delete;
  WeakQueueRef& operator=(const WeakQueueRef&) = delete;

  // Runs `work` on the queue: before it returns when it is called from the queue's own work, else later.
  // False when the gate is closed; then `work` does not run. Never waits for the queue.
  bool run(Task work);

  // From now on nothing comes through. Before the queue ends.
  void close();

 private:
  Mutex mutex_;
  SerialQueue* queue_ GUARDED_BY(mutex_);  // null when closed
};

}  // namespace tonewerk
