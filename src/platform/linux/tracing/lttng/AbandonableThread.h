// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <thread>

#include "values/Mutex.h"
#include "values/UniqueFunction.h"

namespace tonewerk {

// Runs tasks in order on a thread of its own. The tasks may block for ever.
//
// The destructor lets the thread run the queued tasks for a limited time. After that, it abandons the thread
// together with the task that has not returned. So tasks must own everything that they use.
class AbandonableThread {
 public:
  // The queue of tasks. It may outlive the thread. Any thread may use it.
  class Queue {
   public:
    // Never waits. After the thread has ended, `work` is destroyed without being run.
    void post(Task work);
    // How long the current task has been running; zero if no task is running.
    std::chrono::milliseconds busyFor() const;

   private:
    friend class AbandonableThread;

    void run();
    void end();
    // False if the thread has not ended within `timeout`.
    [[nodiscard]] bool waitForEnd(std::chrono::milliseconds timeout);

    mutable Mutex mutex_;
    Condition changed_;
    std::deque<Task> tasks_ GUARDED_BY(mutex_);
    // When the current task started; none while no task is running.
    std::optional<std::chrono::steady_clock::time_point> busySince_ GUARDED_BY(mutex_);
    bool isEnding_ GUARDED_BY(mutex_) = false;
    bool hasEnded_ GUARDED_BY(mutex_) = false;
  };

  // `endTimeout` is how long the destructor waits.
  explicit AbandonableThread(std::chrono::milliseconds endTimeout);
  AbandonableThread(const AbandonableThread&) = delete;
  AbandonableThread& operator=(const AbandonableThread&) = delete;
  // Must not be called from a task.
  ~AbandonableThread();

  const std::shared_ptr<Queue>& queue() const { return queue_; }

 private:
  const std::chrono::milliseconds endTimeout_;
  const std::shared_ptr<Queue> queue_ = std::make_shared<Queue>();
  std::thread thread_;
};

}  // namespace tonewerk
