// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Holds samples, or changes, as records.
class ChanmeterRecordSamples final : public ChanmeterSamples {
 public:
  explicit ChanmeterRecordSamples(ChanmeterRecords records);
  const ChanmeterRecords& records() const { return records_; }

 private:
  const ChanmeterRecords records_;
};

}  // namespace tonewerk
