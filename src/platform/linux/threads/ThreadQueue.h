// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include "platform/Heartbeat.h"
#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// Runs a serial queue's work on its own thread, or, by runAtOnce(), on another one while its own waits.
//
// async() holds the lock only while it adds the work, and wakes the thread only when it is waiting. The
// thread takes all pending work at once and runs it without the lock.
//
// The thread has a heartbeat, which beats after each piece of work. From the moment that work is queued, the
// thread counts as working, even if it does not wake up. Work that another thread runs does not count.
class ThreadQueue final : public SerialQueue {
 public:
  ThreadQueue(std::string name, QueuePriority priority);
  ThreadQueue(const ThreadQueue&) = delete;
  ThreadQueue& operator=(const ThreadQueue&) = delete;
  ~ThreadQueue() override;

  void async(Task work) override;
  void drain() override;
  bool isCurrent() const override {
    const std::thread::id here = std::this_thread::get_id();
    return here == thread_.get_id() || here == borrower_.load(std::memory_order_relaxed);
  }
  const std::string& name() const override { return name_; }

 private:
  [[nodiscard]] bool tryLend() override;
  void takeBack() override;
  void run();
  // Moves all pending work into `batch`, which is empty before. False when the queue ends and no work is
  // left.
  [[nodiscard]] bool waitForWork(std::vector<Task>& batch);

  const std::string name_;
  const QueuePriority priority_;
  Mutex mutex_;
  std::vector<Task> pending_ GUARDED_BY(mutex_);
  bool isWaiting_ GUARDED_BY(mutex_) = false;  // the thread waits for work, or is about to
  bool isLent_ GUARDED_BY(mutex_) = false;  // another thread runs the queue's work, while the own one waits
  bool isEnding_ GUARDED_BY(mutex_) = false;
  Condition workArrived_;
  // Written without the lock only while the thread runs work; otherwise async() or takeBack() may write it.
  const std::shared_ptr<Heartbeat> heartbeat_ = std::make_shared<Heartbeat>();
  std::atomic<std::thread::id> borrower_;  // none while the queue is not lent
  std::thread thread_;                     // last, because it uses all members above
};

}  // namespace tonewerk
