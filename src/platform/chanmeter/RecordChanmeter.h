// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Chanmeter.h"

namespace tonewerk {

// Implements the part of Chanmeter that does not depend on where records come from. A derived class makes
// ChanmeterChannelSets and ChanmeterRecordSamples, and passes no other classes in.
class RecordChanmeter : public Chanmeter {
 public:
  std::int32_t channelCount(const ChanmeterChannels& channels) override;
  // `later` is not null.
  [[nodiscard]] Samples createSamplesDelta(const Samples& earlier, const Samples& later,
                                           std::optional<ChanmeterError>& error) override;
  void iterate(const ChanmeterSamples& samples, const Callback& callback) override;
};

}  // namespace tonewerk
