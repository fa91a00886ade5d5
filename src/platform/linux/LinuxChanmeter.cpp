// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxChanmeter.h"

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/chanmeter/ChanmeterRecordSamples.h"

namespace tonewerk {

Chanmeter::Channels LinuxChanmeter::copyChannelsInGroup(const std::optional<std::string>&,
                                                        const std::optional<std::string>&,
                                                        std::optional<ChanmeterError>&) {
  return std::make_shared<ChanmeterChannelSet>(ChanmeterRecords{});
}

Chanmeter::Subscription LinuxChanmeter::createSubscription(const Channels& channels, Channels& subscribed,
                                                           std::optional<ChanmeterError>&) {
  subscribed = channels;
  return std::make_shared<ChanmeterSubscription>();
}

Chanmeter::Samples LinuxChanmeter::createSamples(const Subscription&, const Channels&,
                                                 std::optional<ChanmeterError>&) {
  return std::make_shared<ChanmeterRecordSamples>(ChanmeterRecords{});
}

}  // namespace tonewerk
