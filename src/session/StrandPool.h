// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>

#include "platform/SerialQueue.h"

namespace tonewerk {

class Strand;
class SinkQueue;

// Serial queues that sessions have for themselves, all on one thread: thousands of sessions do not make
// thousands of threads, and a session that waits for something holds up no other.
//
//   submit() -> [the thread's queue, 64 MiB] -> runs
//                                            -> held behind a piece that waits, 8 MiB -> runs when released
//                                                                                     -> dropped and counted
//
// A full thread's queue makes submit() wait, since the thread gets on with it; what is held waits for others,
// for seconds, and so never holds up who submits.
class StrandPool {
 public:
  // What all queues together hold back.
  static constexpr std::size_t kMaxHeldBytes = std::size_t{8} << 20;

  explicit StrandPool(std::unique_ptr<SerialQueue> thread);
  StrandPool(const StrandPool&) = delete;
  StrandPool& operator=(const StrandPool&) = delete;
  // Runs what is not held and drops the rest. The queues may live on; they are then without effect.
  ~StrandPool();

  // Any thread.
  std::shared_ptr<Strand> makeQueue();

  // Returns when everything submitted before has run or is held.
  void drain();

  // How many pieces were dropped so far, and how many are held.
  std::uint64_t droppedCount() const;
  std::size_t heldCount() const;

 private:
  friend class Strand;
  struct Shared;

  const std::shared_ptr<Shared> shared_;
  std::unique_ptr<SinkQueue> thread_;
};

// One of them. Lives as long as somebody refers to it, work that it holds included.
class Strand : public std::enable_shared_from_this<Strand> {
 public:
  explicit Strand(std::shared_ptr<StrandPool::Shared> shared);
  Strand(const Strand&) = delete;
  Strand& operator=(const Strand&) = delete;
  ~Strand();

  // Any thread but the queues' own, while StrandPool lives. Pieces run in the order of their submission.
  // `bytes`: what `work` keeps.
  void submit(std::size_t bytes, Task work);

  // Any thread; never waits, and does nothing once StrandPool is gone. Runs `work` on the thread between
  // two pieces, also while the queue is held: at once from inside one.
  void interrupt(Task work);

  // On the thread. After hold() the pieces behind the running one wait for release(), which runs them before
  // it returns; one of them may hold again.
  void hold();
  void release();
  bool isHeld() const;

  // On the thread. How many pieces found no room since the last call.
  std::uint64_t takeDroppedCount();

 private:
  friend class StrandPool;
  struct Piece {
    std::size_t bytes = 0;
    Task work;
  };

  // Also true on any thread once StrandPool is gone. For assertions.
  bool ownsThisThread() const;
  void runOrHold(std::size_t bytes, Task work);
  std::deque<Piece> takeHeld();

  const std::shared_ptr<StrandPool::Shared> shared_;
  // The thread's own.
  bool isHeld_ = false;
  std::deque<Piece> held_;
  std::uint64_t droppedCount_ = 0;
};

}  // namespace tonewerk
