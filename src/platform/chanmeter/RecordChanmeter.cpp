// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/RecordChanmeter.h"

#include <cassert>
#include <limits>

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/chanmeter/ChanmeterDifference.h"
#include "platform/chanmeter/ChanmeterRecordSample.h"
#include "platform/chanmeter/ChanmeterRecordSamples.h"

namespace tonewerk {
namespace {

const ChanmeterRecords& recordsOf(const ChanmeterSamples& samples) {
  return static_cast<const ChanmeterRecordSamples&>(samples).records();
}

}  // namespace

std::int32_t RecordChanmeter::channelCount(const ChanmeterChannels& channels) {
  const std::size_t count = static_cast<const ChanmeterChannelSet&>(channels).keys().size();
  assert(count <= static_cast<std::size_t>(std::numeric_limits<std::int32_t>::max()));
  return static_cast<std::int32_t>(count);
}

Chanmeter::Samples RecordChanmeter::createSamplesDelta(const Samples& earlier, const Samples& later,
                                                       std::optional<ChanmeterError>& error) {
  assert(later != nullptr);
  if (earlier == nullptr) {
    error = ChanmeterError{kErrorNoEarlierSamples};
    return nullptr;
  }
  return std::make_shared<ChanmeterRecordSamples>(
      chanmeterDifference(recordsOf(*earlier), recordsOf(*later)));
}

void RecordChanmeter::iterate(const ChanmeterSamples& samples, const Callback& callback) {
  for (const auto& record : recordsOf(samples)) {
    if (callback(ChanmeterRecordSample(record)) != 0) return;
  }
}

}  // namespace tonewerk
