// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Presents a record as a ChanmeterSample. A copy costs a reference count.
class ChanmeterRecordSample final : public ChanmeterSample {
 public:
  // Error numbers of histogramBucketBounds().
  static constexpr int kErrorNoBounds = 1;
  static constexpr int kErrorNoBucket = 2;

  // `record` is not null.
  explicit ChanmeterRecordSample(std::shared_ptr<const ChanmeterRecord> record);

  ChanmeterFormat format() const override { return record_->format; }
  std::optional<std::string_view> group() const override { return record_->key.group; }
  std::optional<std::string_view> subGroup() const override { return record_->key.subGroup; }
  std::optional<std::string_view> driverName() const override { return record_->key.driver; }
  std::optional<std::string_view> channelName() const override { return record_->key.name; }
  std::optional<std::string_view> unitLabel() const override { return record_->unit; }

  std::int64_t simpleIntegerValue() const override;

  std::int32_t stateCount() const override;
  std::string_view stateName(std::int32_t index) const override;
  std::uint64_t stateInTransitions(std::int32_t index) const override;
  std::uint64_t stateResidency(std::int32_t index) const override;
  double stateDutyCycle(std::int32_t index) const override;

  std::int32_t histogramBucketCount() const override;
  [[nodiscard]] int histogramBucketBounds(std::int32_t index, std::int64_t& lower,
                                          std::int64_t& upper) const override;
  std::int64_t histogramBucketHits(std::int32_t index) const override;
  std::int64_t histogramMinValue() const override;
  std::int64_t histogramMaxValue() const override;

 private:
  // Null when the format or the index does not fit.
  const ChanmeterState* state(std::int32_t index) const;
  const ChanmeterBucket* bucket(std::int32_t index) const;

  std::shared_ptr<const ChanmeterRecord> record_;
};

}  // namespace tonewerk
