// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>

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
    bool waitForEnd(std::chrono::milliseconds patience);

    mutable std::mutex mutex_;  // guards all below
    std::condition_variable changed_;
    std::deque<Task> pieces_;
    std::optional<std::chrono::steady_clock::time_point> busySince_;  // none while no piece runs
    bool isEnding_ = false;
    bool hasEnded_ = false;
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
