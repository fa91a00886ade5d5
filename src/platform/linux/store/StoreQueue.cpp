// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueue.h"

#include <utility>

namespace tonewerk {

bool StoreQueue::add(StoreRow row) {
  MutexLock lock(mutex_);
  const std::size_t bytes = bytesOf(row);
  bool hasTimedOut = false;
  if (!fits(bytes) && waitsForRoom_) {
    const auto deadline = std::chrono::steady_clock::now() + limits_.hold;
    while (!fits(bytes) && waitsForRoom_ && room_.waitUntil(lock, deadline)) {
    }
    hasTimedOut = !fits(bytes) && waitsForRoom_;
    if (hasTimedOut) {
      waitsForRoom_ = false;
      room_.notifyAll();
    }
  }
  if (!fits(bytes)) {
    ++dropped_;
    return hasTimedOut;
  }
  const bool wasUrgent = isUrgent();
  queued_.emplace_back(std::move(row));
  queuedBytes_ += bytes;
  ++added_;
  if (queued_.size() == 1 || (isUrgent() && !wasUrgent)) work_.notifyOne();
  return false;
}

bool StoreQueue::flush(std::chrono::milliseconds timeout) {
  MutexLock lock(mutex_);
  const std::uint64_t wanted = added_;
  const std::uint64_t flush = ++lastFlush_;
  ++openFlushes_;
  work_.notifyOne();
  const auto deadline = std::chrono::steady_clock::now() + timeout;
  while (committed_ < wanted && failedFlush_ < flush && progress_.waitUntil(lock, deadline)) {
  }
  --openFlushes_;
  return committed_ >= wanted;
}

void StoreQueue::stop() {
  const MutexLock lock(mutex_);
  stopped_ = true;
  work_.notifyOne();
}

bool StoreQueue::take(std::vector<StoreRow>& batch, bool wait) {
  batch.clear();
  MutexLock lock(mutex_);
  if (wait) {
    while (queued_.empty() && !stopped_ && !isWoken_) work_.wait(lock);
    const auto deadline = std::chrono::steady_clock::now() + limits_.gather;
    while (!isUrgent() && work_.waitUntil(lock, deadline)) {
    }
  }
  isWoken_ = false;
  takenBytes_ = 0;
  while (!queued_.empty() && batch.size() < limits_.batchRows && takenBytes_ < limits_.batchBytes) {
    takenBytes_ += bytesOf(queued_.front());
    batch.push_back(std::move(queued_.front()));
    queued_.pop_front();
  }
  takenRows_ = batch.size();
  queuedBytes_ -= takenBytes_;
  leftOver_ = !queued_.empty();
  return !batch.empty() || !stopped_;
}

void StoreQueue::wakeWriter() {
  const MutexLock lock(mutex_);
  isWoken_ = true;
  work_.notifyAll();
}

void StoreQueue::beginAttempt() {
  const MutexLock lock(mutex_);
  attemptedFlush_ = lastFlush_;
}

void StoreQueue::committed() {
  const MutexLock lock(mutex_);
  committed_ += std::exchange(takenRows_, 0);
  takenBytes_ = 0;
  waitsForRoom_ = true;
  room_.notifyAll();
  progress_.notifyAll();
}

void StoreQueue::failed() {
  const MutexLock lock(mutex_);
  failedFlush_ = attemptedFlush_;
  waitsForRoom_ = false;
  room_.notifyAll();
  progress_.notifyAll();
}

bool StoreQueue::pause(std::chrono::nanoseconds time) {
  MutexLock lock(mutex_);
  const auto deadline = std::chrono::steady_clock::now() + time;
  while (!stopped_ && lastFlush_ <= attemptedFlush_ && work_.waitUntil(lock, deadline)) {
  }
  return !stopped_;
}

std::uint64_t StoreQueue::takeDropped() {
  const MutexLock lock(mutex_);
  return std::exchange(dropped_, 0);
}

std::uint64_t StoreQueue::lost() const {
  const MutexLock lock(mutex_);
  return queued_.size() + takenRows_ + dropped_;
}

bool StoreQueue::fits(std::size_t bytes) const {
  const std::size_t rows = queued_.size() + takenRows_;
  // A row that is larger than all the room passes when the queue is empty.
  return rows == 0 || (rows < limits_.rows && queuedBytes_ + takenBytes_ + bytes <= limits_.bytes);
}

bool StoreQueue::isUrgent() const {
  return stopped_ || isWoken_ || leftOver_ || openFlushes_ > 0 || queued_.size() >= limits_.batchRows ||
         queuedBytes_ >= limits_.bytes / 4;
}

}  // namespace tonewerk
