// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterRecordSamples.h"

#include <utility>

namespace tonewerk {

ChanmeterRecordSamples::ChanmeterRecordSamples(ChanmeterRecords records) : records_(std::move(records)) {}

std::uint64_t ChanmeterRecordSamples::ownBytes() const {
  return sizeof(*this) + records_.capacity() * sizeof(ChanmeterRecords::value_type);
}

}  // namespace tonewerk
