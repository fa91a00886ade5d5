// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <thread>

#include "platform/SerialQueue.h"
#include "platform/SinkStatus.h"
#include "values/Mutex.h"

namespace tonewerk {

class LogCategory;
class Strand;
class SinkQueue;

// Makes serial queues (strands), one for each session that needs one, and runs them all on one thread. So
// thousands of sessions do not need thousands of threads, and a session that waits does not delay the others.
//
//   submit() -> [the thread's queue, 64 MiB] -> runs
//                                            -> held behind a piece that waits, 8 MiB -> runs when released
//                                                                                     -> dropped and counted
//
// Pieces of post() take the same way, but have room everywhere.
//
// submit() waits while the thread's queue is full, because the thread works on it, but not for a thread that
// hangs (SinkQueue.h). It never waits for held pieces, which may wait for seconds.
class StrandPool {
 public:
  // The bytes that all strands together may hold back.
  static constexpr std::size_t kMaxHeldBytes = std::size_t{8} << 20;

  // `name` is that of the status. `log` outlives the pool.
  StrandPool(std::unique_ptr<SerialQueue> thread, std::string name, const LogCategory& log);
  StrandPool(const StrandPool&) = delete;
  StrandPool& operator=(const StrandPool&) = delete;
  // Runs the pieces that are not held and drops the held ones. Strands may outlive the pool; interrupt() then
  // does nothing.
  ~StrandPool();

  // Any thread.
  std::shared_ptr<Strand> makeStrand();

  // Returns when every piece submitted before has run or is held.
  void drain();
  // The same, but returns false after `timeout`.
  [[nodiscard]] bool drain(std::chrono::milliseconds timeout);

  // Any thread. The pieces of all strands.
  SinkStatus status() const;

  // How many pieces have been dropped so far, and how many are held now.
  std::uint64_t droppedCount() const;
  std::size_t heldCount() const;

 private:
  friend class Strand;
  struct Shared;

  const std::shared_ptr<Shared> shared_;
  std::unique_ptr<SinkQueue> thread_;
};

// One serial queue of a StrandPool. Lives while there is a reference to it; its pieces of work may have one.
// No two of its pieces run at the same time.
class Strand : public std::enable_shared_from_this<Strand> {
 public:
  explicit Strand(std::shared_ptr<StrandPool::Shared> shared);
  Strand(const Strand&) = delete;
  Strand& operator=(const Strand&) = delete;
  ~Strand();

  // Queues `work`, which holds `bytes`. Any thread but the pool's own, while the pool lives; only one serial
  // queue when runAtOnce() is used, too. Pieces run in the order of their submission. A piece for which the
  // thread's queue has no room is dropped, counted and logged there; the result is then false.
  bool submit(std::size_t bytes, Task work);

  // The same for work that must run: it is never dropped, whether the thread's queue is full or the strand
  // holds it back, and it does not wait. For work that holds few bytes and is bounded by other means.
  void post(Task work);

  // Runs `work` on the calling thread when no piece waits before it. Returns false, without running it, when
  // one does, or when a piece is running: submit() then keeps the order. `work` must not hold(). One serial
  // queue alone calls it and submit(), while the pool lives.
  template <typename Work>
  [[nodiscard]] bool runAtOnce(Work&& work) {
    if (waitingCount_.load(std::memory_order_acquire) != 0 || isRunningHere() || !running_.try_lock()) {
      return false;
    }
    const Turn turn(*this);
    if (isHeld_) return false;
    work();
    return true;
  }

  // Runs `work` between two pieces, even while the strand holds pieces back; on the pool's thread, or, from
  // inside a piece, on that piece's thread before it returns. Any thread; never waits; does nothing once the
  // pool is gone.
  void interrupt(Task work);

  // In a piece on the pool's thread. After hold() the pieces behind the running one wait for release(), which
  // runs them before it returns. One of them may call hold() again.
  void hold();
  void release();
  bool isHeld() const;

  // In a piece. Returns how many pieces were dropped since the last call because they did not fit.
  std::uint64_t takeDroppedCount();

  // True in a piece, and on any thread once the pool is gone. For assertions.
  bool ownsThisThread() const;

 private:
  friend class StrandPool;
  struct Piece {
    std::size_t bytes = 0;
    Task work;
  };

  // The calling thread's turn to run pieces: takes over the locked running_, and unlocks it in the end.
  class SCOPED_CAPABILITY Turn {
   public:
    explicit Turn(Strand& strand) REQUIRES(strand.running_) : strand_(strand) {
      strand_.runner_.store(std::this_thread::get_id(), std::memory_order_relaxed);
    }
    Turn(const Turn&) = delete;
    Turn& operator=(const Turn&) = delete;
    ~Turn() RELEASE() {
      strand_.runner_.store(std::thread::id(), std::memory_order_relaxed);
      strand_.running_.unlock();
    }

   private:
    Strand& strand_;
  };

  bool isRunningHere() const { return runner_.load(std::memory_order_relaxed) == std::this_thread::get_id(); }
  // Runs `work` when no other piece runs. On the pool's thread.
  void run(const Task& work);
  void runOrHold(std::size_t bytes, Task work, bool mayDrop);
  std::deque<Piece> takeHeld();

  const std::shared_ptr<StrandPool::Shared> shared_;
  std::atomic<std::size_t> waitingCount_ = 0;  // submitted, and neither finished nor dropped
  Mutex running_;                              // held while a piece runs; guards what is below
  std::atomic<std::thread::id> runner_;        // who holds it, if anybody
  bool isHeld_ = false;
  std::deque<Piece> held_;
  std::uint64_t droppedCount_ = 0;
};

}  // namespace tonewerk
