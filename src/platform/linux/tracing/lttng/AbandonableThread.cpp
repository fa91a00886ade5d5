// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/AbandonableThread.h"

#include <utility>

#include "platform/linux/threads/ThreadProperties.h"

namespace tonewerk {

using Clock = std::chrono::steady_clock;

AbandonableThread::AbandonableThread(std::chrono::milliseconds patience)
    : patience_(patience), thread_([queue = queue_] {
        nameThisThread("tonewerk.tracing");
        queue->run();
      }) {}

AbandonableThread::~AbandonableThread() {
  queue_->end();
  if (queue_->waitForEnd(patience_)) {
    thread_.join();
  } else {
    thread_.detach();
  }
}

void AbandonableThread::Queue::post(Task work) {
  const std::lock_guard lock(mutex_);
  if (hasEnded_) return;
  pieces_.push_back(std::move(work));
  changed_.notify_all();
}

std::chrono::milliseconds AbandonableThread::Queue::busyFor() const {
  const std::lock_guard lock(mutex_);
  if (!busySince_) return std::chrono::milliseconds(0);
  return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - *busySince_);
}

void AbandonableThread::Queue::end() {
  const std::lock_guard lock(mutex_);
  isEnding_ = true;
  changed_.notify_all();
}

bool AbandonableThread::Queue::waitForEnd(std::chrono::milliseconds patience) {
  std::unique_lock lock(mutex_);
  return changed_.wait_for(lock, patience, [this] { return hasEnded_; });
}

void AbandonableThread::Queue::run() {
  std::unique_lock lock(mutex_);
  for (;;) {
    changed_.wait(lock, [this] { return isEnding_ || !pieces_.empty(); });
    if (pieces_.empty()) break;
    Task work = std::move(pieces_.front());
    pieces_.pop_front();
    busySince_ = Clock::now();
    lock.unlock();
    work();
    work = {};
    lock.lock();
    busySince_.reset();
  }
  hasEnded_ = true;
  changed_.notify_all();
}

}  // namespace tonewerk
