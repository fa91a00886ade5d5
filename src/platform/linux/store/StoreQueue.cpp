// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueue.h"

#include <utility>

namespace tonewerk {

bool StoreQueue::add(StoreRow row) {
  std::unique_lock lock(mutex_);
  const std::size_t bytes = bytesOf(row);
  bool heldUp = false;
  if (!fits(bytes) && holds_) {
    heldUp = !room_.wait_for(lock, limits_.hold, [&] { return fits(bytes) || !holds_; });
    if (heldUp) {
      holds_ = false;
      room_.notify_all();
    }
  }
  if (!fits(bytes)) {
    ++dropped_;
    return heldUp;
  }
  const bool wasUrgent = isUrgent();
  queued_.emplace_back(std::move(row));
  queuedBytes_ += bytes;
  ++added_;
  if (queued_.size() == 1 || (isUrgent() && !wasUrgent)) work_.notify_one();
  return false;
}

bool StoreQueue::flush(std::chrono::milliseconds timeout) {
  std::unique_lock lock(mutex_);
  const std::uint64_t wanted = added_;
  const std::uint64_t flush = ++lastFlush_;
  ++openFlushes_;
  work_.notify_one();
  progress_.wait_for(lock, timeout, [&] { return committed_ >= wanted || failedFlush_ >= flush; });
  --openFlushes_;
  return committed_ >= wanted;
}

void StoreQueue::stop() {
  const std::lock_guard lock(mutex_);
  stopped_ = true;
  work_.notify_one();
}

bool StoreQueue::take(std::vector<StoreRow>& batch, bool wait) {
  batch.clear();
  std::unique_lock lock(mutex_);
  if (wait) {
    work_.wait(lock, [&] { return !queued_.empty() || stopped_ || nudged_; });
    work_.wait_for(lock, limits_.gather, [&] { return isUrgent(); });
  }
  nudged_ = false;
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

void StoreQueue::nudge() {
  const std::lock_guard lock(mutex_);
  nudged_ = true;
  work_.notify_all();
}

void StoreQueue::attempt() {
  const std::lock_guard lock(mutex_);
  attemptedFlush_ = lastFlush_;
}

void StoreQueue::committed() {
  const std::lock_guard lock(mutex_);
  committed_ += std::exchange(takenRows_, 0);
  takenBytes_ = 0;
  holds_ = true;
  room_.notify_all();
  progress_.notify_all();
}

void StoreQueue::failed() {
  const std::lock_guard lock(mutex_);
  failedFlush_ = attemptedFlush_;
  holds_ = false;
  room_.notify_all();
  progress_.notify_all();
}

bool StoreQueue::pause(std::chrono::nanoseconds time) {
  std::unique_lock lock(mutex_);
  work_.wait_for(lock, time, [&] { return stopped_ || lastFlush_ > attemptedFlush_; });
  return !stopped_;
}

std::uint64_t StoreQueue::takeDropped() {
  const std::lock_guard lock(mutex_);
  return std::exchange(dropped_, 0);
}

std::uint64_t StoreQueue::lost() const {
  const std::lock_guard lock(mutex_);
  return queued_.size() + takenRows_ + dropped_;
}

bool StoreQueue::fits(std::size_t bytes) const {
  const std::size_t rows = queued_.size() + takenRows_;
  // A row larger than all the room there is passes alone.
  return rows == 0 || (rows < limits_.rows && queuedBytes_ + takenBytes_ + bytes <= limits_.bytes);
}

bool StoreQueue::isUrgent() const {
  return stopped_ || nudged_ || leftOver_ || openFlushes_ > 0 || queued_.size() >= limits_.batchRows ||
         queuedBytes_ >= limits_.bytes / 4;
}

}  // namespace tonewerk
