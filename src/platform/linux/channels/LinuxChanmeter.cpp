// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/LinuxChanmeter.h"

#include <memory>

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/chanmeter/ChanmeterRecordSamples.h"

namespace tonewerk {

Chanmeter::Channels LinuxChanmeter::copyChannelsInGroup(const std::optional<std::string>& group,
                                                        const std::optional<std::string>& subGroup,
                                                        std::optional<ChanmeterError>& error) {
  std::optional<ChanmeterError> failure;
  const ChanmeterRecords records = read(ChannelChoice(group, subGroup), failure);
  if (failure) error = failure;
  return std::make_shared<ChanmeterChannelSet>(records);
}

Chanmeter::Subscription LinuxChanmeter::createSubscription(const Channels& channels, Channels& subscribed,
                                                           std::optional<ChanmeterError>& /*error*/) {
  subscribed = channels;
  return std::make_shared<ChanmeterSubscription>();
}

Chanmeter::Samples LinuxChanmeter::createSamples(const Subscription& /*subscription*/,
                                                 const Channels& subscribed,
                                                 std::optional<ChanmeterError>& error) {
  const auto& channels = static_cast<const ChanmeterChannelSet&>(*subscribed);
  std::optional<ChanmeterError> failure;
  ChanmeterRecords records = read(ChannelChoice(channels), failure);
  if (failure) error = failure;
  if (records.empty() && failure) return nullptr;
  return std::make_shared<ChanmeterRecordSamples>(std::move(records));
}

ChanmeterRecords LinuxChanmeter::read(const ChannelChoice& choice, std::optional<ChanmeterError>& failure) {
  ChanmeterRecords records;
  kernel_.read(choice, records, failure);
  published_.read(choice, records, failure);
  return records;
}

}  // namespace tonewerk
