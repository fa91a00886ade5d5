// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpOutbox.h"

#include <algorithm>
#include <utility>

namespace tonewerk {
namespace {

// Memory that a record takes in addition to its text.
constexpr std::size_t kRecordBytes = 64;

std::size_t bytesOf(const std::string& record) { return record.size() + kRecordBytes; }

}  // namespace

OtlpOutbox::Added OtlpOutbox::add(std::string record, Urgency urgency, Time now) {
  const MutexLock lock(mutex_);
  const std::size_t bytes = bytesOf(record);
  if (bytes_ + bytes > limits_.bytes) {
    ++dropped_;
    ++allDropped_;
    return Added::kDropped;
  }
  bytes_ += bytes;
  if (count_++ == 0) movedAt_ = now;
  const bool isUrgent = urgency == Urgency::kAtOnce;
  std::deque<Waiting>& waiting = isUrgent ? atOnce_ : batched_;
  waiting.push_back({std::move(record), now});
  const bool changed =
      waiting.size() == 1 || (!isUrgent && batched_.size() == limits_.batchRecords && flushed_ == 0);
  return changed ? Added::kChangedDue : Added::kKept;
}

bool OtlpOutbox::flush() {
  const MutexLock lock(mutex_);
  flushed_ = batched_.size();
  return flushed_ > 0;
}

std::optional<OtlpOutbox::Time> OtlpOutbox::nextDue() const {
  const MutexLock lock(mutex_);
  if (!atOnce_.empty()) return atOnce_.front().addedAt;
  return batchedDue();
}

std::optional<OtlpOutbox::Time> OtlpOutbox::batchedDue() const {
  if (batched_.empty()) return std::nullopt;
  const Time addedAt = batched_.front().addedAt;
  const bool isDueNow = flushed_ > 0 || batched_.size() >= limits_.batchRecords;
  return isDueNow ? addedAt : addedAt + limits_.batchTime;
}

OtlpOutbox::Batch OtlpOutbox::take(Time now) {
  const MutexLock lock(mutex_);
  if (!atOnce_.empty()) return takeFrom(atOnce_);
  const std::optional<Time> due = batchedDue();
  if (!due || *due > now) return {};
  Batch batch = takeFrom(batched_);
  flushed_ -= std::min(flushed_, batch.records.size());
  return batch;
}

OtlpOutbox::Batch OtlpOutbox::takeFrom(std::deque<Waiting>& waiting) {
  Batch batch;
  while (!waiting.empty() && batch.records.size() < limits_.batchRecords) {
    const std::size_t bytes = bytesOf(waiting.front().record);
    if (!batch.records.empty() && batch.bytes + bytes > limits_.batchBytes) break;
    batch.bytes += bytes;
    batch.records.push_back(std::move(waiting.front().record));
    waiting.pop_front();
  }
  return batch;
}

void OtlpOutbox::settle(const Batch& batch, Time now) {
  const MutexLock lock(mutex_);
  movedAt_ = now;
  bytes_ -= batch.bytes;
  count_ -= batch.records.size();
}

std::uint64_t OtlpOutbox::takeDropped() {
  const MutexLock lock(mutex_);
  return std::exchange(dropped_, 0);
}

std::size_t OtlpOutbox::count() const {
  const MutexLock lock(mutex_);
  return count_;
}

std::uint64_t OtlpOutbox::allDropped() const {
  const MutexLock lock(mutex_);
  return allDropped_;
}

OtlpOutbox::Time OtlpOutbox::stillSince(Time now) const {
  const MutexLock lock(mutex_);
  return count_ == 0 ? Time(0) : now - movedAt_;
}

}  // namespace tonewerk
