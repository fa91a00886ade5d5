// SPDX-License-Identifier: Apache-2.0
#include "session/SinkQueue.h"

#include <cassert>
#include <utility>

namespace tonewerk {

SinkQueue::SinkQueue(std::unique_ptr<SerialQueue> queue) : queue_(std::move(queue)) {}

SinkQueue::~SinkQueue() { queue_.reset(); }

void SinkQueue::submit(std::size_t bytes, Task work) {
  assert(!queue_->isCurrent());  // it would wait for itself
  {
    MutexLock lock(mutex_);
    while (!hasRoomFor(bytes)) roomMade_.wait(lock);
    waitingBytes_ += bytes;
  }
  queue_->async([this, bytes, work = std::move(work)]() mutable {
    work();
    work = nullptr;  // frees its memory before its room is reported
    finished(bytes);
  });
}

void SinkQueue::post(Task work) { queue_->async(std::move(work)); }

void SinkQueue::drain() { queue_->drain(); }

bool SinkQueue::isCurrent() const { return queue_->isCurrent(); }

bool SinkQueue::ownsThisThread() const { return queue_->ownsThisThread(); }

bool SinkQueue::hasRoomFor(std::size_t bytes) const {
  return waitingBytes_ == 0 || waitingBytes_ + bytes <= kMaxWaitingBytes;
}

void SinkQueue::finished(std::size_t bytes) {
  const MutexLock lock(mutex_);
  waitingBytes_ -= bytes;
  roomMade_.notifyAll();
}

}  // namespace tonewerk
