// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterRecordSamples.h"

#include <utility>

namespace tonewerk {

ChanmeterRecordSamples::ChanmeterRecordSamples(ChanmeterRecords records) : records_(std::move(records)) {}

}  // namespace tonewerk
