// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <thread>
#include <vector>

#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// A serial queue with a thread of its own.
//
// async() takes a lock for the length of a push and wakes the thread only when it waits; the thread takes all
// that waits at once. Work runs outside the lock.
class ThreadQueue final : public SerialQueue {
 public:
  ThreadQueue(std::string name, QueuePriority priority);
  ThreadQueue(const ThreadQueue&) = delete;
  ThreadQueue& operator=(const ThreadQueue&) = delete;
  ~ThreadQueue() override;

  void async(Task work) override;
  void drain() override;
  bool isCurrent() const override { return std::this_thread::get_id() == thread_.get_id(); }
  const std::string& name() const override { return name_; }

 private:
  void run();
  // False when the queue ends and nothing is left.
  [[nodiscard]] bool waitForWork(std::vector<Task>& batch);

  const std::string name_;
  const QueuePriority priority_;
  Mutex mutex_;
  std::vector<Task> pending_ GUARDED_BY(mutex_);
  bool isWaiting_ GUARDED_BY(mutex_) = false;  // the thread sleeps, or is about to
  bool isEnding_ GUARDED_BY(mutex_) = false;
  Condition workArrived_;
  std::thread thread_;  // last: it uses all above
};

}  // namespace tonewerk
