// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/AbandonableThread.h"

#include <utility>

#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {

using Clock = std::chrono::steady_clock;

AbandonableThread::AbandonableThread(std::chrono::milliseconds endTimeout)
    : endTimeout_(endTimeout), thread_([queue = queue_] {
        nameThisThread("tonewerk.tracing");
        queue->run();
      }) {}

AbandonableThread::~AbandonableThread() {
  queue_->end();
  if (queue_->waitForEnd(endTimeout_)) {
    thread_.join();
  } else {
    thread_.detach();
  }
}

void AbandonableThread::Queue::post(Task work) {
  const MutexLock lock(mutex_);
  if (hasEnded_) return;
  tasks_.push_back(std::move(work));
  changed_.notifyAll();
}

std::chrono::milliseconds AbandonableThread::Queue::busyFor() const {
  const MutexLock lock(mutex_);
  if (!busySince_) return std::chrono::milliseconds(0);
  return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - *busySince_);
}

void AbandonableThread::Queue::end() {
  const MutexLock lock(mutex_);
  isEnding_ = true;
  changed_.notifyAll();
}

bool AbandonableThread::Queue::waitForEnd(std::chrono::milliseconds timeout) {
  MutexLock lock(mutex_);
  const Clock::time_point deadline = Clock::now() + timeout;
  while (!hasEnded_ && changed_.waitUntil(lock, deadline)) {
  }
  return hasEnded_;
}

void AbandonableThread::Queue::run() {
  MutexLock lock(mutex_);
  for (;;) {
    while (!isEnding_ && tasks_.empty()) changed_.wait(lock);
    if (tasks_.empty()) break;
    Task work = std::move(tasks_.front());
    tasks_.pop_front();
    busySince_ = Clock::now();
    lock.unlock();
    work();
    work = {};
    lock.lock();
    busySince_.reset();
  }
  hasEnded_ = true;
  changed_.notifyAll();
}

}  // namespace tonewerk
