// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueue.h"

#include <utility>

namespace tonewerk {

StoreQueue::~StoreQueue() {
  StoreCharges givenBack;
  {
    const MutexLock lock(mutex_);
    givenBack = beginDropping();
  }
  givenBack.give();
}

bool StoreQueue::isShared(const RtcMessageRow& row, const StoreRowOwner& owner) {
  const MutexLock lock(mutex_);
  return filling_.share(row, owner.user);
}

bool StoreQueue::waitForRoom(MutexLock& lock, std::size_t bytes) {
  if (fits(bytes) || !waitsForRoom_) return false;
  const auto deadline = std::chrono::steady_clock::now() + limits_.hold;
  while (!fits(bytes) && waitsForRoom_ && room_.waitUntil(lock, deadline)) {
  }
  return !fits(bytes) && waitsForRoom_;
}

StoreCharges StoreQueue::beginDropping() {
  room_.notifyAll();
  return std::exchange(waitsForRoom_, false) ? charges() : StoreCharges();
}

StoreCharges StoreQueue::charges() const {
  StoreCharges sum = takenCharges_;
  for (const StoreBatch& batch : full_) sum.add(batch.charges());
  sum.add(filling_.charges());
  return sum;
}

bool StoreQueue::isTaken(const StoreRowOwner& owner, std::size_t bytes) {
  if (fits(bytes) && (waitsForRoom_ || isWithinHalf(owner))) return true;
  ++dropped_;
  ++allDropped_;
  if (owner.account != nullptr) owner.account->countRefusal(Resource::kSinkBytes);
  return false;
}

// Asked only while rows are dropped, when nothing keeps the sum for each user.
bool StoreQueue::isWithinHalf(const StoreRowOwner& owner) const {
  if (owner.account == nullptr) return true;
  const std::size_t queued = charges().of(*owner.account);
  return queued == 0 || queued + owner.charge <= limits_.bytes / 2;
}

StoreBatch& StoreQueue::batchWithRoom() {
  if (filling_.rows() >= limits_.batchRows || filling_.bytes() >= limits_.batchBytes) {
    filling_.endSharing();
    full_.push_back(std::move(filling_));
    filling_ = std::exchange(spare_, StoreBatch());
  }
  return filling_;
}

void StoreQueue::countAdded(std::size_t bytes, const StoreRowOwner& owner) {
  if (waitsForRoom_ && owner.account != nullptr) owner.account->charge(Resource::kSinkBytes, owner.charge);
  const bool wasUrgent = isUrgent();
  if (queuedRows_ + takenRows_ == 0) movedAt_ = std::chrono::steady_clock::now();
  ++queuedRows_;
  queuedBytes_ += bytes;
  ++added_;
  if (queuedRows_ == 1 || (isUrgent() && !wasUrgent)) work_.notifyOne();
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

bool StoreQueue::take(StoreBatch& batch, bool wait) {
  batch.clear();
  MutexLock lock(mutex_);
  if (wait) {
    while (queuedRows_ == 0 && !stopped_ && !isWoken_) work_.wait(lock);
    const auto deadline = std::chrono::steady_clock::now() + limits_.gather;
    while (!isUrgent() && work_.waitUntil(lock, deadline)) {
    }
  }
  isWoken_ = false;
  if (full_.empty()) {
    filling_.endSharing();
    std::swap(batch, filling_);
  } else {
    std::swap(batch, full_.front());
    spare_ = std::move(full_.front());
    full_.pop_front();
  }
  movedAt_ = std::chrono::steady_clock::now();
  takenRows_ = batch.rows();
  takenBytes_ = batch.bytes();
  takenCharges_ = batch.charges();
  queuedRows_ -= takenRows_;
  queuedBytes_ -= takenBytes_;
  leftOver_ = queuedRows_ > 0;
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
  StoreCharges givenBack;
  {
    const MutexLock lock(mutex_);
    std::swap(givenBack, takenCharges_);
    if (!waitsForRoom_) givenBack.clear();
  }
  givenBack.give();
  const MutexLock lock(mutex_);
  if (!std::exchange(waitsForRoom_, true)) charges().charge();
  committed_ += std::exchange(takenRows_, 0);
  movedAt_ = std::chrono::steady_clock::now();
  takenBytes_ = 0;
  room_.notifyAll();
  progress_.notifyAll();
}

void StoreQueue::failed() {
  StoreCharges givenBack;
  {
    const MutexLock lock(mutex_);
    givenBack = beginDropping();
  }
  givenBack.give();
  const MutexLock lock(mutex_);
  failedFlush_ = attemptedFlush_;
  progress_.notifyAll();
}

bool StoreQueue::pause(std::chrono::nanoseconds time) {
  MutexLock lock(mutex_);
  const auto deadline = std::chrono::steady_clock::now() + time;
  while (!stopped_ && lastFlush_ <= attemptedFlush_ && work_.waitUntil(lock, deadline)) {
  }
  return !stopped_;
}

std::uint64_t StoreQueue::added() const {
  const MutexLock lock(mutex_);
  return added_;
}

bool StoreQueue::hasCommitted(std::uint64_t added) const {
  const MutexLock lock(mutex_);
  return committed_ >= added;
}

std::uint64_t StoreQueue::takeDropped() {
  const MutexLock lock(mutex_);
  return std::exchange(dropped_, 0);
}

SinkStatus StoreQueue::status() const {
  const auto now = std::chrono::steady_clock::now();
  const MutexLock lock(mutex_);
  SinkStatus status{
      .name = "store", .waiting = queuedRows_ + takenRows_, .dropped = allDropped_, .hangs = {}};
  const bool moves = status.waiting == 0 || now - movedAt_ < limits_.hold;
  if (!moves) status.hangs = std::chrono::ceil<std::chrono::seconds>(now - movedAt_);
  return status;
}

std::uint64_t StoreQueue::lost() const {
  const MutexLock lock(mutex_);
  return queuedRows_ + takenRows_ + dropped_;
}

bool StoreQueue::fits(std::size_t bytes) const {
  const std::size_t rows = queuedRows_ + takenRows_;
  // A row that is larger than all the room passes when the queue is empty.
  return rows == 0 || (rows < limits_.rows && queuedBytes_ + takenBytes_ + bytes <= limits_.bytes);
}

bool StoreQueue::isUrgent() const {
  return stopped_ || isWoken_ || leftOver_ || openFlushes_ > 0 || queuedRows_ >= limits_.batchRows ||
         queuedBytes_ >= limits_.bytes / 4;
}

}  // namespace tonewerk
