// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <vector>

#include "values/Mutex.h"

namespace tonewerk {

// Queues encoded records for export. One size limit applies to the records that wait and those that are being
// exported.
//
//   add() -> at once  -> take() at the next call -> settle()
//         -> batched  -> take() when there are 512, after 5 s, or flushed -> settle()
//
// A record that does not fit is dropped and counted; add() never waits. Any thread. Times are those of the
// monotonic clock.
class OtlpOutbox {
 public:
  using Time = std::chrono::nanoseconds;

  struct Limits {
    std::size_t bytes = std::size_t{8} << 20;
    std::size_t batchRecords = 512;
    std::size_t batchBytes = std::size_t{4} << 20;
    Time batchTime = std::chrono::seconds(5);  // the longest time that a record waits for its batch
  };
  enum class Urgency { kBatched, kAtOnce };
  enum class Added {
    kDropped,
    kKept,
    kChangedDue,  // kept, and nextDue() has changed
  };
  struct Batch {
    std::vector<std::string> records;
    std::size_t bytes = 0;
  };

  explicit OtlpOutbox(const Limits& limits) : limits_(limits) {}

  [[nodiscard]] Added add(std::string record, Urgency urgency, Time now);
  // Makes all waiting batched records due. False if there are none.
  [[nodiscard]] bool flush();

  // When the next record is due, which may be in the past; none if no record waits.
  [[nodiscard]] std::optional<Time> nextDue() const;
  // Takes records that are due: at least one, and at most `batchRecords` and `batchBytes`, unless a single
  // record is larger. Empty if no record is due.
  [[nodiscard]] Batch take(Time now);
  // Frees the room of a batch that was delivered or dropped.
  void settle(const Batch& batch, Time now);

  // The number of records that were dropped for lack of room since the last call.
  [[nodiscard]] std::uint64_t takeDropped();
  // The number of records that wait or are being exported.
  std::size_t count() const;
  // How many records were ever dropped for lack of room.
  std::uint64_t allDropped() const;
  // How long no record has left while at least one was there; 0 while there is none.
  Time stillSince(Time now) const;

 private:
  struct Waiting {
    std::string record;
    Time addedAt;
  };

  [[nodiscard]] std::optional<Time> batchedDue() const REQUIRES(mutex_);
  [[nodiscard]] Batch takeFrom(std::deque<Waiting>& waiting) REQUIRES(mutex_);

  const Limits limits_;
  mutable Mutex mutex_;
  std::deque<Waiting> atOnce_ GUARDED_BY(mutex_);
  std::deque<Waiting> batched_ GUARDED_BY(mutex_);
  std::size_t flushed_ GUARDED_BY(mutex_) = 0;  // this many at the front of batched_ are due
  std::size_t bytes_ GUARDED_BY(mutex_) = 0;
  std::size_t count_ GUARDED_BY(mutex_) = 0;
  std::uint64_t dropped_ GUARDED_BY(mutex_) = 0;
  std::uint64_t allDropped_ GUARDED_BY(mutex_) = 0;
  Time movedAt_ GUARDED_BY(mutex_){0};
};

}  // namespace tonewerk
