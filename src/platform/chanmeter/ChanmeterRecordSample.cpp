// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterRecordSample.h"

#include <cassert>
#include <limits>
#include <utility>

namespace tonewerk {
namespace {

// Elements beyond the largest index cannot be accessed.
std::int32_t countOf(std::size_t size) {
  constexpr auto kMax = std::numeric_limits<std::int32_t>::max();
  return size > static_cast<std::size_t>(kMax) ? kMax : static_cast<std::int32_t>(size);
}

template <typename T>
const T* at(const std::vector<T>& items, std::int32_t index) {
  if (index < 0 || static_cast<std::size_t>(index) >= items.size()) return nullptr;
  return &items[static_cast<std::size_t>(index)];
}

}  // namespace

ChanmeterRecordSample::ChanmeterRecordSample(std::shared_ptr<const ChanmeterRecord> record)
    : record_(std::move(record)) {
  assert(record_ != nullptr);
}

const ChanmeterState* ChanmeterRecordSample::state(std::int32_t index) const {
  return format() == kChanmeterFormatState ? at(record_->states, index) : nullptr;
}

const ChanmeterBucket* ChanmeterRecordSample::bucket(std::int32_t index) const {
  return format() == kChanmeterFormatHistogram ? at(record_->buckets, index) : nullptr;
}

std::int64_t ChanmeterRecordSample::simpleIntegerValue() const {
  return format() == kChanmeterFormatSimple ? record_->value : 0;
}

std::int32_t ChanmeterRecordSample::stateCount() const {
  return format() == kChanmeterFormatState ? countOf(record_->states.size()) : 0;
}

std::string_view ChanmeterRecordSample::stateName(std::int32_t index) const {
  const ChanmeterState* found = state(index);
  return found == nullptr ? std::string_view() : found->name;
}

std::uint64_t ChanmeterRecordSample::stateInTransitions(std::int32_t index) const {
  const ChanmeterState* found = state(index);
  return found == nullptr ? 0 : found->transitions;
}

std::uint64_t ChanmeterRecordSample::stateResidency(std::int32_t index) const {
  const ChanmeterState* found = state(index);
  return found == nullptr ? 0 : found->residency;
}

double ChanmeterRecordSample::stateDutyCycle(std::int32_t index) const {
  const ChanmeterState* found = state(index);
  return found == nullptr ? 0.0 : found->dutyCycle;
}

std::int32_t ChanmeterRecordSample::histogramBucketCount() const {
  return format() == kChanmeterFormatHistogram ? countOf(record_->buckets.size()) : 0;
}

int ChanmeterRecordSample::histogramBucketBounds(std::int32_t index, std::int64_t& lower,
                                                 std::int64_t& upper) const {
  const ChanmeterBucket* found = bucket(index);
  if (found == nullptr) return kErrorNoBucket;
  if (!found->lower || !found->upper) return kErrorNoBounds;
  lower = *found->lower;
  upper = *found->upper;
  return 0;
}

std::int64_t ChanmeterRecordSample::histogramBucketHits(std::int32_t index) const {
  const ChanmeterBucket* found = bucket(index);
  return found == nullptr ? 0 : found->hits;
}

std::int64_t ChanmeterRecordSample::histogramMinValue() const {
  return format() == kChanmeterFormatHistogram ? record_->minimum : 0;
}

std::int64_t ChanmeterRecordSample::histogramMaxValue() const {
  return format() == kChanmeterFormatHistogram ? record_->maximum : 0;
}

}  // namespace tonewerk
