// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/chanmeter/RecordChanmeter.h"
#include "platform/linux/channels/KernelSoundChannels.h"
#include "platform/linux/channels/PublishedChannels.h"

namespace tonewerk {

// The channels that drivers and processes publish in files, and those made of what the kernel says of sound
// cards. docs/driver-channels.md describes both; error codes are those of ChannelFailure.
//
// Sources are read on the caller's thread, the kernel's first. One that fails takes its own channels with it
// and no others: an error then comes together with a set. Samples are null when nothing at all could be read
// because of failures.
//
// Who is subscribed to channels gets those alone: files of other drivers are not read for it, unless nobody
// has read them yet.
class LinuxChanmeter final : public RecordChanmeter {
 public:
  // `root` is where /proc and /sys are, empty for the real ones. `log` outlives this.
  LinuxChanmeter(std::string channelsDirectory, const LogCategory& log, const std::string& root = {})
      : kernel_(root, log), published_(std::move(channelsDirectory), log) {}

  [[nodiscard]] Channels copyChannelsInGroup(const std::optional<std::string>& group,
                                             const std::optional<std::string>& subGroup,
                                             std::optional<ChanmeterError>& error) override;
  // All channels can be subscribed.
  [[nodiscard]] Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                                std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                                      std::optional<ChanmeterError>& error) override;

 private:
  ChanmeterRecords read(const ChannelChoice& choice, std::optional<ChanmeterError>& failure);

  KernelSoundChannels kernel_;
  PublishedChannels published_;
};

}  // namespace tonewerk
