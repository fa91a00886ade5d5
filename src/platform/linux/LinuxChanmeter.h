// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/chanmeter/RecordChanmeter.h"

namespace tonewerk {

// A system without channels: every group is empty.
class LinuxChanmeter final : public RecordChanmeter {
 public:
  Channels copyChannelsInGroup(const std::optional<std::string>& group,
                               const std::optional<std::string>& subGroup,
                               std::optional<ChanmeterError>& error) override;
  Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                  std::optional<ChanmeterError>& error) override;
  Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                        std::optional<ChanmeterError>& error) override;
};

}  // namespace tonewerk
