// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Chanmeter.h"

namespace tonewerk {

// What a library of channels can do without knowing where its records come from. Who derives from it makes
// ChanmeterChannelSets and ChanmeterRecordSamples, and passes nothing else in.
class RecordChanmeter : public Chanmeter {
 public:
  std::int32_t channelCount(const ChanmeterChannels& channels) override;
  // `later` is not null.
  [[nodiscard]] Samples createSamplesDelta(const Samples& earlier, const Samples& later,
                                           std::optional<ChanmeterError>& error) override;
  void iterate(const ChanmeterSamples& samples, const Callback& callback) override;
};

}  // namespace tonewerk
