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

// A thread for work that may never return. Runs pieces in order.
//
// Destroying it runs what is queued, for a while; a piece that does not return by then is left behind with
// its thread. What pieces use therefore belongs to them, not to whoever destroys this.
class AbandonableThread {
 public:
  // Where pieces wait; may outlive the thread. Any thread.
  class Queue {
   public:
    // Never waits. Once the thread has ended, `work` is destroyed instead.
    void post(Task work);
    // How long the piece that runs has been running; zero when none does.
    std::chrono::milliseconds busyFor() const;

   private:
    friend class AbandonableThread;

    void run();
    void end();
    [[nodiscard]] bool waitForEnd(std::chrono::milliseconds patience);

    mutable Mutex mutex_;
    Condition changed_;
    std::deque<Task> pieces_ GUARDED_BY(mutex_);
    // None while no piece runs.
    std::optional<std::chrono::steady_clock::time_point> busySince_ GUARDED_BY(mutex_);
    bool isEnding_ GUARDED_BY(mutex_) = false;
    bool hasEnded_ GUARDED_BY(mutex_) = false;
  };

  // `patience`: how long the destructor waits.
  explicit AbandonableThread(std::chrono::milliseconds patience);
  AbandonableThread(const AbandonableThread&) = delete;
  AbandonableThread& operator=(const AbandonableThread&) = delete;
  // Not from a piece.
  ~AbandonableThread();

  const std::shared_ptr<Queue>& queue() const { return queue_; }

 private:
  const std::chrono::milliseconds patience_;
  const std::shared_ptr<Queue> queue_ = std::make_shared<Queue>();
  std::thread thread_;
};

}  // namespace tonewerk
