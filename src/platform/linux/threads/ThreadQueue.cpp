// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadQueue.h"

#include <cassert>
#include <future>
#include <utility>

#include "platform/linux/threads/BatchScope.h"
#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {
namespace {

// A larger buffer is freed after the burst that needed it.
constexpr std::size_t kMaxKeptCapacity = 4096;

// Niceness. User-interactive queues run before ordinary threads where that is permitted, utility queues after
// them.
constexpr int kUserInteractiveNiceness = -10;
constexpr int kUtilityNiceness = 5;

}  // namespace

ThreadQueue::ThreadQueue(std::string name, QueuePriority priority)
    : name_(std::move(name)), priority_(priority), thread_([this] { run(); }) {}

ThreadQueue::~ThreadQueue() {
  assert(!isCurrent());
  {
    const MutexLock lock(mutex_);
    isEnding_ = true;
  }
  workArrived_.notifyOne();
  thread_.join();
}

void ThreadQueue::async(Task work) {
  bool mustWake = false;
  {
    const MutexLock lock(mutex_);
    pending_.push_back(std::move(work));
    mustWake = !isLent_ && std::exchange(isWaiting_, false);
    if (mustWake) heartbeat_->beat();
  }
  if (mustWake) workArrived_.notifyOne();
}

bool ThreadQueue::tryLend() {
  assert(!isCurrent());
  {
    const MutexLock lock(mutex_);
    if (!isWaiting_ || isLent_) return false;  // a waiting thread has nothing pending
    isLent_ = true;
  }
  borrower_.store(std::this_thread::get_id(), std::memory_order_relaxed);
  return true;
}

void ThreadQueue::takeBack() {
  borrower_.store(std::thread::id(), std::memory_order_relaxed);
  // Notifies with the lock, because the queue may end as soon as its own thread goes on.
  const MutexLock lock(mutex_);
  isLent_ = false;
  if ((isEnding_ || !pending_.empty()) && std::exchange(isWaiting_, false)) {
    heartbeat_->beat();
    workArrived_.notifyOne();
  }
}

void ThreadQueue::drain() {
  assert(!isCurrent());
  std::promise<void> promise;
  const std::future<void> future = promise.get_future();
  async([reached = std::move(promise)]() mutable { reached.set_value(); });
  future.wait();
}

void ThreadQueue::run() {
  nameThisThread(name_);
  setNicenessOfThisThread(priority_ == QueuePriority::kUserInteractive ? kUserInteractiveNiceness
                                                                       : kUtilityNiceness);
  const Heartbeat::OnThisThread heartbeat(heartbeat_);
  std::vector<Task> batch;
  while (waitForWork(batch)) {
    const BatchScope scope;
    for (Task& next : batch) {
      {
        const Task work = std::move(next);  // destroyed before the next piece of work runs
        work();
      }
      BatchScope::pieceHasRun();
      heartbeat_->beat();
    }
    batch.clear();
    if (batch.capacity() > kMaxKeptCapacity) std::vector<Task>().swap(batch);
  }
}

bool ThreadQueue::waitForWork(std::vector<Task>& batch) {
  MutexLock lock(mutex_);
  while (pending_.empty() || isLent_) {
    if (isEnding_ && !isLent_) return false;
    isWaiting_ = true;
    heartbeat_->rest();
    workArrived_.wait(lock);
  }
  isWaiting_ = false;
  heartbeat_->beat();
  batch.swap(pending_);
  return true;
}

}  // namespace tonewerk
