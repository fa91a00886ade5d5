// SPDX-License-Identifier: Apache-2.0
#include "session/SinkQueue.h"

#include <algorithm>
#include <cassert>
#include <future>
#include <utility>

#include "platform/Log.h"

namespace tonewerk {

SinkQueue::SinkQueue(std::unique_ptr<SerialQueue> queue, std::string name, const LogCategory& log,
                     const Limits& limits)
    : name_(std::move(name)),
      log_(log),
      limits_(limits),
      movedAt_(std::chrono::steady_clock::now()),
      queue_(std::move(queue)) {}

// The queue goes first. Its last pieces log what was dropped: while something is dropped, something waits.
SinkQueue::~SinkQueue() = default;

bool SinkQueue::submit(std::size_t bytes, Task work) {
  assert(!queue_->isCurrent());  // it would wait for itself
  bool beginsDropping = false;
  {
    MutexLock lock(mutex_);
    const bool wasDropping = isDropping_;
    const bool isTaken = waitForRoom(lock, bytes);
    beginsDropping = !wasDropping && isDropping_;
    if (isTaken) {
      beginWork();
      ++waiting_;
      waitingBytes_ += bytes;
    } else {
      ++dropped_;
      ++unsaid_;
    }
    if (!isTaken && !beginsDropping) return false;
  }
  if (beginsDropping) {
    errorLog(log_, "%@ hangs; what does not fit is dropped", name_);
    return false;
  }
  queue_->async([this, bytes, work = std::move(work)]() mutable {
    learnHeartbeat();
    work();
    work = nullptr;  // frees its memory before its room is reported
    finished(bytes);
  });
  return true;
}

bool SinkQueue::waitForRoom(MutexLock& lock, std::size_t bytes) {
  if (hasRoomFor(bytes)) return true;
  if (isDropping_) return false;
  Time now = std::chrono::steady_clock::now();
  const Time end = now + limits_.longestWait;
  Time holdEnd = now + limits_.hold;
  lookForProgress(now);
  Time moved = movedAt_;
  while (!hasRoomFor(bytes)) {
    if (isDropping_ || now >= end) return false;
    roomMade_.waitUntil(lock, std::min(holdEnd, end));
    now = std::chrono::steady_clock::now();
    lookForProgress(now);
    if (movedAt_ > moved) {
      moved = movedAt_;
      holdEnd = moved + limits_.hold;
      Heartbeat::beatHere();  // who waits for a slow sink does not hang
    } else if (now >= holdEnd && !hasRoomFor(bytes)) {
      isDropping_ = true;
    }
  }
  return true;
}

void SinkQueue::lookForProgress(Time now) const {
  const std::uint64_t progress = finished_ + (heartbeat_ == nullptr ? 0 : heartbeat_->read().beats);
  if (std::exchange(seen_, progress) != progress) movedAt_ = now;
}

// A sink without work did not hang until now.
void SinkQueue::beginWork() {
  if (waiting_ + posted_ == 0) movedAt_ = std::chrono::steady_clock::now();
}

void SinkQueue::post(Task work) {
  {
    const MutexLock lock(mutex_);
    beginWork();
    ++posted_;
  }
  queue_->async([this, work = std::move(work)]() mutable {
    learnHeartbeat();
    work();
    work = nullptr;
    finishedPosted();
  });
}

void SinkQueue::countLost() {
  const MutexLock lock(mutex_);
  ++dropped_;
}

void SinkQueue::drain() { queue_->drain(); }

bool SinkQueue::drain(std::chrono::milliseconds timeout) {
  {
    // The status after it tells what has moved since.
    const MutexLock lock(mutex_);
    lookForProgress(std::chrono::steady_clock::now());
  }
  const auto reached = std::make_shared<std::promise<void>>();
  const std::future<void> future = reached->get_future();
  queue_->async([reached] { reached->set_value(); });
  return future.wait_for(timeout) == std::future_status::ready;
}

SinkStatus SinkQueue::status() const {
  const Time now = std::chrono::steady_clock::now();
  const MutexLock lock(mutex_);
  lookForProgress(now);
  const bool moves = waiting_ + posted_ == 0 || now == movedAt_ || now - movedAt_ < limits_.hold;
  return {.name = name_,
          .waiting = waiting_,
          .dropped = dropped_,
          .hangs = moves ? std::chrono::seconds(0) : std::chrono::ceil<std::chrono::seconds>(now - movedAt_)};
}

bool SinkQueue::isCurrent() const { return queue_->isCurrent(); }

bool SinkQueue::ownsThisThread() const { return queue_->ownsThisThread(); }

bool SinkQueue::hasRoomFor(std::size_t bytes) const {
  return waitingBytes_ == 0 || waitingBytes_ + bytes <= limits_.waitingBytes;
}

// In a piece of work, so on one thread at a time.
void SinkQueue::learnHeartbeat() {
  if (knowsHeartbeat_.exchange(true, std::memory_order_relaxed)) return;
  const MutexLock lock(mutex_);
  heartbeat_ = Heartbeat::ofThisThread();
}

void SinkQueue::finished(std::size_t bytes) {
  std::uint64_t dropped = 0;
  {
    const MutexLock lock(mutex_);
    waitingBytes_ -= bytes;
    --waiting_;
    dropped = noteEnd();
  }
  logDropped(dropped);
}

void SinkQueue::finishedPosted() {
  std::uint64_t dropped = 0;
  {
    const MutexLock lock(mutex_);
    --posted_;
    dropped = noteEnd();
  }
  logDropped(dropped);
}

std::uint64_t SinkQueue::noteEnd() {
  ++finished_;
  isDropping_ = false;
  roomMade_.notifyAll();
  return std::exchange(unsaid_, 0);
}

void SinkQueue::logDropped(std::uint64_t dropped) const {
  if (dropped > 0) errorLog(log_, "%@ makes progress again; dropped meanwhile: %llu", name_, dropped);
}

}  // namespace tonewerk
