// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Holds samples, or changes, as records.
class ChanmeterRecordSamples final : public ChanmeterSamples {
 public:
  explicit ChanmeterRecordSamples(ChanmeterRecords records);
  const ChanmeterRecords& records() const { return records_; }
  // Those of the list, which refers to records that others hold, too.
  std::uint64_t ownBytes() const override;

 private:
  const ChanmeterRecords records_;
};

}  // namespace tonewerk
