// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>

#include "platform/SinkStatus.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/store/StoreBatch.h"
#include "values/Mutex.h"

namespace tonewerk {

// The bounded queue between the threads that record and the one thread that writes.
//
//   add ... add ->  queued  -> take() -> being written -> committed()
//                                             |  ^
//                                     failed()v  |  after pause()
//                                          kept by the writer
//
// Rows wait in batches, as they will be written: a batch is full when it has the rows or bytes of one
// transaction. The writer takes whole batches, and their memory is used again for later rows.
//
// Rows count against the bounds until they are committed. While writing succeeds, add() waits for room. After
// failed(), or when the writer makes no progress for the hold time, add() does not wait until the next
// committed(): rows that do not fit are dropped and counted. Then the rows of one user also fit only into
// half of the bytes, so that there is room for others' rows.
//
// While add() waits for room, the user of each row is charged for it (Resource::kSinkBytes). So whoever gives
// work to the recording threads can let a user's work wait before it fills the queue and all others wait.
// While rows are dropped nobody is charged: that work would wait for the disk.
class StoreQueue {
 public:
  struct Limits {
    std::size_t rows = 8192;
    std::size_t bytes = 16 << 20;
    // The writer waits this long for more rows, or until `batchRows` rows or a quarter of `bytes` wait.
    std::chrono::milliseconds gather{80};
    std::size_t batchRows = 1000;
    // The most rows of one batch, and about the most bytes: the file exceeds its bounds by one batch at most.
    std::size_t batchBytes = 512 << 10;
    // The longest time that add() waits.
    std::chrono::milliseconds hold{2000};
  };

  explicit StoreQueue(const Limits& limits) : limits_(limits) {}
  StoreQueue(const StoreQueue&) = delete;
  StoreQueue& operator=(const StoreQueue&) = delete;
  // Gives back what is still charged.
  ~StoreQueue();

  // Any thread, which holds no lock, because other users' work may go on within the call. `row` is of any
  // type that StoreBatch takes, and belongs to the user for whom the thread works (WorkingFor). True when
  // this row waited for the whole hold time, so that from now on rows are dropped.
  template <typename Row>
  [[nodiscard]] bool add(const Row& row, JournalPosition::Row position = {}) {
    return addAs(row, position, true);
  }
  // The same, but never waits: a row that does not fit is dropped and counted.
  template <typename Row>
  void addIfRoom(const Row& row) {
    (void)addAs(row, {}, false);
  }

  // Any thread. Waits until everything added before is committed. False when the first try to write that
  // begins after the call fails, or after `timeout`.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);

  // Any thread. The next take(), or one that waits now, returns without waiting for rows, perhaps with none.
  void wakeWriter();

  // Any thread. Ends take() when the queue is empty, and pause().
  void stop();

  // The functions from here to pause() are for the writer's thread. take() replaces `batch`, whose rows are
  // committed, by the next batch. Without `wait` it returns at once, maybe with none. False when stopped and
  // empty.
  [[nodiscard]] bool take(StoreBatch& batch, bool wait);
  // A try to write the batch begins.
  void beginAttempt();
  // The batch is in the file. Like failed(), it gives back charges before flush() returns, and the caller
  // holds no lock.
  void committed();
  // The batch is not in the file. The writer keeps it.
  void failed();
  // Returns after `time`, or earlier when flush() or stop() ask for another try. False when stopped: that try
  // is the last.
  [[nodiscard]] bool pause(std::chrono::nanoseconds time);

  // Any thread. How many rows have been added, and whether the first `added` of them are committed.
  std::uint64_t added() const;
  bool hasCommitted(std::uint64_t added) const;
  // Any thread. The number of rows dropped since the last call.
  [[nodiscard]] std::uint64_t takeDropped();
  // Any thread. All rows that wait or are being written, all that were dropped, and for how long the writer
  // has taken and committed none, once that is longer than the hold time.
  SinkStatus status() const;
  // Any thread. The rows that are not committed, and those dropped since the last takeDropped(). They are
  // lost when the writer has ended.
  std::uint64_t lost() const;

 private:
  template <typename Row>
  [[nodiscard]] bool addAs(const Row& row, JournalPosition::Row position, bool mayWait) {
    StoreRowOwner owner;
    owner.position = position;
    owner.account = WorkingFor::accountIfAny();
    if (owner.account != nullptr) owner.user = owner.account->user();
    if (isShared(row, owner)) return false;
    const StoreRowText text(row);  // the JSON is made without the lock
    const std::size_t bytes = StoreBatch::bytesOf(row, text);
    owner.charge = chargeFor(bytes);
    bool hasTimedOut = false;
    StoreCharges givenBack;
    {
      MutexLock lock(mutex_);
      hasTimedOut = mayWait && waitForRoom(lock, bytes);
      if (hasTimedOut) givenBack = beginDropping();
      if (isTaken(owner, bytes)) {
        batchWithRoom().add(row, text, owner);
        countAdded(bytes, owner);
      }
    }
    givenBack.give();
    return hasTimedOut;
  }
  // Whether the row has become part of one that is in the queue already, and so takes no room.
  [[nodiscard]] bool isShared(const RtcMessageRow& row, const StoreRowOwner& owner);
  template <typename Row>
  [[nodiscard]] bool isShared(const Row& /*row*/, const StoreRowOwner& /*owner*/) {
    return false;
  }
  // A row of few bytes bears its part of the bound of rows.
  std::size_t chargeFor(std::size_t bytes) const { return std::max(bytes, limits_.bytes / limits_.rows); }
  // True when it waited for the whole hold time without success.
  [[nodiscard]] bool waitForRoom(MutexLock& lock, std::size_t bytes) REQUIRES(mutex_);
  // From now on add() does not wait and charges nobody. Returns what is to be given back when the lock is
  // released.
  [[nodiscard]] StoreCharges beginDropping() REQUIRES(mutex_);
  // What the rows in the queue bear, those that are being written included.
  StoreCharges charges() const REQUIRES(mutex_);
  // Whether there is room for the row. If not, it counts as dropped.
  [[nodiscard]] bool isTaken(const StoreRowOwner& owner, std::size_t bytes) REQUIRES(mutex_);
  [[nodiscard]] bool isWithinHalf(const StoreRowOwner& owner) const REQUIRES(mutex_);
  // The batch for the next row.
  StoreBatch& batchWithRoom() REQUIRES(mutex_);
  void countAdded(std::size_t bytes, const StoreRowOwner& owner) REQUIRES(mutex_);
  bool fits(std::size_t bytes) const REQUIRES(mutex_);
  bool isUrgent() const REQUIRES(mutex_);

  const Limits limits_;
  mutable Mutex mutex_;
  Condition work_;      // the writer waits for work
  Condition room_;      // add() waits for room
  Condition progress_;  // flush() waits for commits

  std::deque<StoreBatch> full_ GUARDED_BY(mutex_);  // the oldest rows
  StoreBatch filling_ GUARDED_BY(mutex_);           // the rows after them
  StoreBatch spare_ GUARDED_BY(mutex_);             // empty, and perhaps with memory for later rows
  std::size_t queuedRows_ GUARDED_BY(mutex_) = 0;   // in full_ and filling_
  bool leftOver_ GUARDED_BY(mutex_) = false;        // rows that did not fit into the last batch
  std::size_t queuedBytes_ GUARDED_BY(mutex_) = 0;
  std::size_t takenRows_ GUARDED_BY(mutex_) = 0;
  std::size_t takenBytes_ GUARDED_BY(mutex_) = 0;
  StoreCharges takenCharges_ GUARDED_BY(mutex_);
  // Whether add() waits for room. Then, and only then, all rows in the queue are charged.
  bool waitsForRoom_ GUARDED_BY(mutex_) = true;
  bool stopped_ GUARDED_BY(mutex_) = false;
  bool isWoken_ GUARDED_BY(mutex_) = false;
  std::uint64_t added_ GUARDED_BY(mutex_) = 0;
  std::uint64_t committed_ GUARDED_BY(mutex_) = 0;
  std::uint64_t dropped_ GUARDED_BY(mutex_) = 0;
  std::uint64_t allDropped_ GUARDED_BY(mutex_) = 0;
  // When the first row came into the empty queue, or later the writer took or committed a batch.
  std::chrono::steady_clock::time_point movedAt_ GUARDED_BY(mutex_);
  // Flushes are numbered. When a try to write fails, the flushes fail that were asked for before it began.
  std::uint64_t lastFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t attemptedFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t failedFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t openFlushes_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
