// SPDX-License-Identifier: Apache-2.0
#include "session/PrivateQueues.h"

#include <cassert>
#include <mutex>
#include <set>
#include <utility>

#include "session/SinkQueue.h"

namespace tonewerk {
namespace {

// What a held piece takes beside what it keeps: so that empty ones are bounded, too.
constexpr std::size_t kPieceBytes = 256;

}  // namespace

struct PrivateQueues::Shared {
  std::mutex mutex;                 // guards all below
  SinkQueue* thread = nullptr;      // null when it is gone
  std::set<PrivateQueue*> holding;  // queues that hold pieces
  std::size_t heldBytes = 0;
  std::size_t heldCount = 0;
  std::uint64_t droppedCount = 0;

  bool keep(PrivateQueue& queue, std::size_t bytes) {
    const std::lock_guard lock(mutex);
    if (heldBytes + bytes > kMostHeldBytes) {
      ++droppedCount;
      return false;
    }
    heldBytes += bytes;
    ++heldCount;
    holding.insert(&queue);
    return true;
  }

  void give(PrivateQueue& queue, std::size_t bytes, std::size_t count, bool isEmpty) {
    const std::lock_guard lock(mutex);
    heldBytes -= bytes;
    heldCount -= count;
    if (isEmpty) holding.erase(&queue);
  }
};

PrivateQueues::PrivateQueues(std::unique_ptr<SerialQueue> thread)
    : shared_(std::make_shared<Shared>()), thread_(std::make_unique<SinkQueue>(std::move(thread))) {
  shared_->thread = thread_.get();
}

PrivateQueues::~PrivateQueues() {
  thread_->drain();
  {
    const std::lock_guard lock(shared_->mutex);
    shared_->thread = nullptr;
  }
  thread_.reset();
  // Held pieces refer to whoever refers to their queue, so nobody else lets go of them.
  for (;;) {
    std::shared_ptr<PrivateQueue> queue;
    {
      const std::lock_guard lock(shared_->mutex);
      if (shared_->holding.empty()) return;
      queue = (*shared_->holding.begin())->weak_from_this().lock();
      shared_->holding.erase(shared_->holding.begin());
    }
    if (queue != nullptr) queue->takeHeld();
  }
}

std::shared_ptr<PrivateQueue> PrivateQueues::makeQueue() { return std::make_shared<PrivateQueue>(shared_); }

void PrivateQueues::drain() { thread_->drain(); }

std::uint64_t PrivateQueues::droppedCount() const {
  const std::lock_guard lock(shared_->mutex);
  return shared_->droppedCount;
}

std::size_t PrivateQueues::heldCount() const {
  const std::lock_guard lock(shared_->mutex);
  return shared_->heldCount;
}

PrivateQueue::PrivateQueue(std::shared_ptr<PrivateQueues::Shared> shared) : shared_(std::move(shared)) {}

PrivateQueue::~PrivateQueue() { takeHeld(); }

void PrivateQueue::submit(std::size_t bytes, Task work) {
  SinkQueue* thread = nullptr;
  {
    const std::lock_guard lock(shared_->mutex);
    thread = shared_->thread;
  }
  assert(thread != nullptr);
  thread->submit(bytes + kPieceBytes, [self = shared_from_this(), bytes, held = std::move(work)]() mutable {
    self->runOrHold(bytes, std::move(held));
  });
}

void PrivateQueue::interrupt(Task work) {
  {
    const std::lock_guard lock(shared_->mutex);
    if (shared_->thread == nullptr) return;
    if (!shared_->thread->isCurrent()) {
      shared_->thread->post(std::move(work));
      return;
    }
  }
  work();
}

void PrivateQueue::hold() { isHeld_ = true; }

void PrivateQueue::release() {
  isHeld_ = false;
  while (!isHeld_ && !held_.empty()) {
    const Piece piece = std::move(held_.front());
    held_.pop_front();
    shared_->give(*this, piece.bytes, 1, held_.empty());
    piece.work();
  }
}

std::uint64_t PrivateQueue::takeDroppedCount() { return std::exchange(droppedCount_, 0); }

void PrivateQueue::runOrHold(std::size_t bytes, Task work) {
  if (!isHeld_) {
    work();
  } else if (shared_->keep(*this, bytes + kPieceBytes)) {
    held_.push_back({bytes + kPieceBytes, std::move(work)});
  } else {
    ++droppedCount_;
  }
}

std::deque<PrivateQueue::Piece> PrivateQueue::takeHeld() {
  std::deque<Piece> taken = std::move(held_);
  held_.clear();
  std::size_t bytes = 0;
  for (const Piece& piece : taken) bytes += piece.bytes;
  shared_->give(*this, bytes, taken.size(), true);
  return taken;
}

}  // namespace tonewerk
