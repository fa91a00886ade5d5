// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/LinuxChanmeter.h"

#include <memory>
#include <utility>

#include "platform/chanmeter/ChanmeterChannelSet.h"
#include "platform/chanmeter/ChanmeterRecordSamples.h"

namespace tonewerk {
namespace {

class LinuxSubscription final : public ChanmeterSubscription {
 public:
  explicit LinuxSubscription(Chanmeter::Channels channels) : channels_(std::move(channels)) {}

  // Null for other channels than the subscribed ones, because a selection is for one choice.
  PublishedChannels::Selection* selectionFor(const Chanmeter::Channels& channels) const {
    return channels == channels_ ? &selection_ : nullptr;
  }

 private:
  const Chanmeter::Channels channels_;
  mutable PublishedChannels::Selection selection_;  // only PublishedChannels uses it, which has a lock
};

}  // namespace

Chanmeter::Channels LinuxChanmeter::copyChannelsInGroup(const std::optional<std::string>& group,
                                                        const std::optional<std::string>& subGroup,
                                                        std::optional<ChanmeterError>& error) {
  std::optional<ChanmeterError> failure;
  PublishedChannels::Reading reading;
  const ChanmeterRecords records = read(ChannelChoice(group, subGroup), reading, nullptr, failure);
  if (failure) error = failure;
  return std::make_shared<ChanmeterChannelSet>(records);
}

Chanmeter::Subscription LinuxChanmeter::createSubscription(const Channels& channels, Channels& subscribed,
                                                           std::optional<ChanmeterError>& /*error*/) {
  subscribed = channels;
  return std::make_shared<LinuxSubscription>(channels);
}

Chanmeter::Samples LinuxChanmeter::createSamples(const Subscription& subscription, const Channels& subscribed,
                                                 std::optional<ChanmeterError>& error) {
  return createSamplesIn(beginReading(), subscription, subscribed, error);
}

Chanmeter::Reading LinuxChanmeter::beginReading() { return std::make_shared<PublishedChannels::Reading>(); }

Chanmeter::Samples LinuxChanmeter::createSamplesIn(const Reading& reading, const Subscription& subscription,
                                                   const Channels& subscribed,
                                                   std::optional<ChanmeterError>& error) {
  const auto& channels = static_cast<const ChanmeterChannelSet&>(*subscribed);
  std::optional<ChanmeterError> failure;
  ChanmeterRecords records =
      read(ChannelChoice(channels), static_cast<PublishedChannels::Reading&>(*reading),
           static_cast<const LinuxSubscription&>(*subscription).selectionFor(subscribed), failure);
  if (failure) error = failure;
  if (records.empty() && failure) return nullptr;
  records.shrink_to_fit();  // a session holds the list until it stops
  return std::make_shared<ChanmeterRecordSamples>(std::move(records));
}

ChanmeterRecords LinuxChanmeter::read(const ChannelChoice& choice, PublishedChannels::Reading& reading,
                                      PublishedChannels::Selection* selection,
                                      std::optional<ChanmeterError>& failure) {
  ChanmeterRecords records;
  kernel_.read(choice, records, failure);
  published_.read(choice, reading, selection, records, failure);
  return records;
}

}  // namespace tonewerk
