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

// Encoded records that wait to be exported, and those that are being exported: bounded together.
//
//   add() -> at once  -> take() as soon as anybody looks -> settle()
//         -> batched  -> take() when there are 512, after 5 s, or flushed -> settle()
//
// What does not fit is dropped and counted; nobody ever waits. Any thread. Times are the monotonic clock's.
class OtlpOutbox {
 public:
  using Time = std::chrono::nanoseconds;

  struct Limits {
    std::size_t bytes = std::size_t{8} << 20;
    std::size_t batchRecords = 512;
    std::size_t batchBytes = std::size_t{4} << 20;
    Time gather = std::chrono::seconds(5);
  };
  enum class Urgency { kBatched, kAtOnce };
  enum class Added {
    kDropped,
    kKept,
    kChangedDue,  // something is due at another time than before
  };
  struct Batch {
    std::vector<std::string> records;
    std::size_t bytes = 0;
  };

  explicit OtlpOutbox(const Limits& limits) : limits_(limits) {}

  [[nodiscard]] Added add(std::string record, Urgency urgency, Time now);
  // What waits now is due. False when nothing does.
  [[nodiscard]] bool flush();

  // When something is due, perhaps in the past; none when nothing waits.
  [[nodiscard]] std::optional<Time> nextDue() const;
  // Some of what is due, at least one record and not much more than `batchBytes`; empty when nothing is.
  [[nodiscard]] Batch take(Time now);
  // What was taken is delivered or dropped: its room is free.
  void settle(const Batch& batch);

  // Records dropped for want of room since the last call.
  [[nodiscard]] std::uint64_t takeDropped();
  // Records that wait or are being exported.
  std::size_t count() const;

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
  std::size_t flushed_ GUARDED_BY(mutex_) = 0;  // of batched_, the first so many are due
  std::size_t bytes_ GUARDED_BY(mutex_) = 0;
  std::size_t count_ GUARDED_BY(mutex_) = 0;
  std::uint64_t dropped_ GUARDED_BY(mutex_) = 0;
};

}  // namespace tonewerk
