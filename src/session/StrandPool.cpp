// SPDX-License-Identifier: Apache-2.0
#include "session/StrandPool.h"

#include <cassert>
#include <set>
#include <utility>

#include "session/SinkQueue.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

// Counted for each held piece in addition to its own bytes, so that the number of empty pieces is limited.
constexpr std::size_t kPieceBytes = 256;

}  // namespace

struct StrandPool::Shared {
  Mutex mutex;
  SinkQueue* thread GUARDED_BY(mutex) = nullptr;  // null once the pool ends
  std::set<Strand*> holding GUARDED_BY(mutex);    // strands that hold pieces
  std::size_t heldBytes GUARDED_BY(mutex) = 0;
  std::size_t heldCount GUARDED_BY(mutex) = 0;
  std::uint64_t droppedCount GUARDED_BY(mutex) = 0;

  bool reserve(Strand& strand, std::size_t bytes, bool mayDrop) {
    const MutexLock lock(mutex);
    if (mayDrop && heldBytes + bytes > kMaxHeldBytes) {
      ++droppedCount;
      return false;
    }
    heldBytes += bytes;
    ++heldCount;
    holding.insert(&strand);
    return true;
  }

  void giveBack(Strand& strand, std::size_t bytes, std::size_t count, bool isEmpty) {
    const MutexLock lock(mutex);
    heldBytes -= bytes;
    heldCount -= count;
    if (isEmpty) holding.erase(&strand);
  }
};

StrandPool::StrandPool(std::unique_ptr<SerialQueue> thread, std::string name, const LogCategory& log)
    : shared_(std::make_shared<Shared>()),
      thread_(std::make_unique<SinkQueue>(std::move(thread), std::move(name), log)) {
  const MutexLock lock(shared_->mutex);
  shared_->thread = thread_.get();
}

StrandPool::~StrandPool() {
  thread_->drain();
  {
    const MutexLock lock(shared_->mutex);
    shared_->thread = nullptr;
  }
  thread_.reset();
  // A held piece may refer to an object that refers to its strand. Only taking the pieces out ends that
  // cycle.
  for (;;) {
    std::shared_ptr<Strand> strand;
    {
      const MutexLock lock(shared_->mutex);
      if (shared_->holding.empty()) return;
      strand = (*shared_->holding.begin())->weak_from_this().lock();
      shared_->holding.erase(shared_->holding.begin());
    }
    if (strand != nullptr) strand->takeHeld();
  }
}

std::shared_ptr<Strand> StrandPool::makeStrand() { return std::make_shared<Strand>(shared_); }

void StrandPool::drain() { thread_->drain(); }

bool StrandPool::drain(std::chrono::milliseconds timeout) { return thread_->drain(timeout); }

SinkStatus StrandPool::status() const {
  SinkStatus status = thread_->status();
  status.waiting += heldCount();
  status.dropped += droppedCount();
  return status;
}

std::uint64_t StrandPool::droppedCount() const {
  const MutexLock lock(shared_->mutex);
  return shared_->droppedCount;
}

std::size_t StrandPool::heldCount() const {
  const MutexLock lock(shared_->mutex);
  return shared_->heldCount;
}

Strand::Strand(std::shared_ptr<StrandPool::Shared> shared) : shared_(std::move(shared)) {}

Strand::~Strand() { takeHeld(); }

bool Strand::submit(std::size_t bytes, Task work) {
  waitingCount_.fetch_add(1, std::memory_order_relaxed);
  SinkQueue* thread = nullptr;
  {
    const MutexLock lock(shared_->mutex);
    thread = shared_->thread;
  }
  assert(thread != nullptr);
  const bool isTaken = thread->submit(bytes + kPieceBytes,
                                      [self = shared_from_this(), bytes, held = std::move(work)]() mutable {
                                        self->runOrHold(bytes, std::move(held), true);
                                      });
  if (!isTaken) waitingCount_.fetch_sub(1, std::memory_order_release);
  return isTaken;
}

void Strand::post(Task work) {
  waitingCount_.fetch_add(1, std::memory_order_relaxed);
  SinkQueue* thread = nullptr;
  {
    const MutexLock lock(shared_->mutex);
    thread = shared_->thread;
  }
  assert(thread != nullptr);
  thread->post([self = shared_from_this(), held = std::move(work)]() mutable {
    self->runOrHold(0, std::move(held), false);
  });
}

void Strand::interrupt(Task work) {
  {
    const MutexLock lock(shared_->mutex);
    if (shared_->thread == nullptr) return;
    if (!isRunningHere() && !shared_->thread->isCurrent()) {
      shared_->thread->post([self = shared_from_this(), held = std::move(work)] { self->run(held); });
      return;
    }
  }
  if (isRunningHere()) return work();
  run(work);
}

void Strand::run(const Task& work) {
  running_.lock();
  const Turn turn(*this);
  work();
}

void Strand::hold() {
  assert(ownsThisThread());
  isHeld_ = true;
}

bool Strand::isHeld() const {
  assert(ownsThisThread());
  return isHeld_;
}

void Strand::release() {
  assert(ownsThisThread());
  isHeld_ = false;
  while (!isHeld_ && !held_.empty()) {
    const Piece piece = std::move(held_.front());
    held_.pop_front();
    shared_->giveBack(*this, piece.bytes, 1, held_.empty());
    piece.work();
    waitingCount_.fetch_sub(1, std::memory_order_release);
  }
}

std::uint64_t Strand::takeDroppedCount() {
  assert(ownsThisThread());
  return std::exchange(droppedCount_, 0);
}

bool Strand::ownsThisThread() const {
  if (isRunningHere()) return true;
  const MutexLock lock(shared_->mutex);
  return shared_->thread == nullptr;
}

void Strand::runOrHold(std::size_t bytes, Task work, bool mayDrop) {
  run([&] {
    if (!isHeld_) {
      work();
    } else if (shared_->reserve(*this, bytes + kPieceBytes, mayDrop)) {
      held_.push_back({bytes + kPieceBytes, std::move(work)});
      return;
    } else {
      ++droppedCount_;
    }
    waitingCount_.fetch_sub(1, std::memory_order_release);
  });
}

std::deque<Strand::Piece> Strand::takeHeld() {
  std::deque<Piece> taken = std::move(held_);
  held_.clear();
  std::size_t bytes = 0;
  for (const Piece& piece : taken) bytes += piece.bytes;
  shared_->giveBack(*this, bytes, taken.size(), true);
  return taken;
}

}  // namespace tonewerk
