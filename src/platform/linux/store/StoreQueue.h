// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <vector>

#include "platform/linux/store/StoreRow.h"
#include "values/Mutex.h"

namespace tonewerk {

// The bounded queue between those who record and the one thread that writes.
//
//   add ... add ->  queued  -> take() -> being written -> committed()
//                                             |  ^
//                                     failed()v  |  after pause()
//                                          kept by the writer
//
// Rows count against the bounds until they are committed. While writing goes well, add() waits for room.
// After failed(), or when the writer does nothing for the hold time, add() never waits: what does not fit is
// dropped and counted, until the next committed().
class StoreQueue {
 public:
  struct Limits {
    std::size_t rows = 8192;
    std::size_t bytes = 16 << 20;
    // Rows wait this long for company, or until there are so many or a quarter of the bytes.
    std::chrono::milliseconds gather{80};
    std::size_t batchRows = 1000;
    // What is taken at once is at most so many rows and about so many bytes, so that the file never outgrows
    // its bounds by more.
    std::size_t batchBytes = 512 << 10;
    // The longest that add() waits.
    std::chrono::milliseconds hold{2000};
  };

  explicit StoreQueue(const Limits& limits) : limits_(limits) {}

  // Any thread. Returns true when this row begins a time of dropping because of the hold time.
  [[nodiscard]] bool add(StoreRow row);

  // Any thread. Waits until everything added before is committed; false when the first try to write that
  // began after the call fails, or after `timeout`.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);

  // Any thread. The next take() does not wait for rows, or one that waits comes back, perhaps with none.
  void nudge();

  // Ends take() and pause(), once the queue is empty or writing fails.
  void stop();

  // The writer's thread. Replaces `batch`, whose rows are committed, by the next rows. Without `wait` it
  // comes back at once, perhaps with none. False when stopped and empty.
  [[nodiscard]] bool take(std::vector<StoreRow>& batch, bool wait);
  // A try to write what was taken begins.
  void attempt();
  // The rows taken are in the file.
  void committed();
  // The rows taken are not in the file; the writer keeps them.
  void failed();
  // Returns after `time` or when flush() or stop() ask for another try. False when stopped: that try is the
  // last.
  [[nodiscard]] bool pause(std::chrono::nanoseconds time);

  // The number of rows dropped since the last time.
  [[nodiscard]] std::uint64_t takeDropped();
  // Rows that are not committed, and those dropped since the last takeDropped(): what is lost when nobody
  // writes any more.
  std::uint64_t lost() const;

 private:
  bool fits(std::size_t bytes) const REQUIRES(mutex_);
  bool isUrgent() const REQUIRES(mutex_);

  const Limits limits_;
  mutable Mutex mutex_;
  Condition work_;      // for the writer
  Condition room_;      // for add()
  Condition progress_;  // for flush()

  std::deque<StoreRow> queued_ GUARDED_BY(mutex_);
  bool leftOver_ GUARDED_BY(mutex_) = false;  // rows that did not fit into the last batch
  std::size_t queuedBytes_ GUARDED_BY(mutex_) = 0;
  std::size_t takenRows_ GUARDED_BY(mutex_) = 0;
  std::size_t takenBytes_ GUARDED_BY(mutex_) = 0;
  bool holds_ GUARDED_BY(mutex_) = true;  // whether add() waits for room
  bool stopped_ GUARDED_BY(mutex_) = false;
  bool nudged_ GUARDED_BY(mutex_) = false;
  std::uint64_t added_ GUARDED_BY(mutex_) = 0;
  std::uint64_t committed_ GUARDED_BY(mutex_) = 0;
  std::uint64_t dropped_ GUARDED_BY(mutex_) = 0;
  // Flushes are numbered. A try that fails disappoints those asked for before it began.
  std::uint64_t lastFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t attemptedFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t failedFlush_ GUARDED_BY(mutex_) = 0;
  std::uint64_t openFlushes_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
