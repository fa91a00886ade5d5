// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "platform/SerialQueue.h"
#include "values/Mutex.h"

namespace tonewerk {

// A queue without a thread: work waits until the test runs it, on the test's own thread.
//
//   ManualSerialQueue queue("work");
//   queue.async([&] { done = true; });
//   queue.runAll();                          // also runs what the work itself queues
//
// Any thread may call async(). Functions that run work (runAll, drain, the destructor) must be called by one
// thread at a time.
class ManualSerialQueue final : public SerialQueue {
 public:
  explicit ManualSerialQueue(std::string name, QueuePriority priority = QueuePriority::kUtility)
      : name_(std::move(name)), priority_(priority) {}
  ManualSerialQueue(const ManualSerialQueue&) = delete;
  ManualSerialQueue& operator=(const ManualSerialQueue&) = delete;
  ~ManualSerialQueue() override;

  void async(Task work) override;
  void drain() override { runAll(); }
  bool isCurrent() const override { return runner_.load() == std::this_thread::get_id(); }
  // Also true on the thread that made the queue: tests call objects that live on the queue directly.
  bool ownsThisThread() const override { return isCurrent() || std::this_thread::get_id() == maker_; }
  const std::string& name() const override { return name_; }

  // From now on runAtOnce() runs work, while none is queued.
  void allowRunningAtOnce() { mayLend_ = true; }

  // Runs work until none waits. Returns how many pieces ran. Do not call it from the queue's own work.
  std::size_t runAll();
  std::size_t pendingCount() const;
  QueuePriority priority() const { return priority_; }

  // Runs at the end of the destructor. For ManualQueues.
  void setDestructionHandler(std::function<void()> handler) { onDestruction_ = std::move(handler); }

 private:
  [[nodiscard]] bool tryLend() override;
  void takeBack() override { runner_ = std::thread::id(); }

  const std::string name_;
  const QueuePriority priority_;
  const std::thread::id maker_ = std::this_thread::get_id();
  mutable Mutex mutex_;
  std::vector<Task> pending_ GUARDED_BY(mutex_);
  std::atomic<std::thread::id> runner_{};
  bool mayLend_ = false;
  std::function<void()> onDestruction_;
};

}  // namespace tonewerk
