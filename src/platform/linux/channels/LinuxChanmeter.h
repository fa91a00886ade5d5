// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/chanmeter/RecordChanmeter.h"
#include "platform/linux/channels/KernelSoundChannels.h"
#include "platform/linux/channels/PublishedChannels.h"

namespace tonewerk {

class Accounts;

// Provides the channels that drivers and processes publish in files, and channels made from the kernel's
// status files of sound cards. docs/driver-channels.md describes both. Error codes are those of
// ChannelFailure.
//
// Sources are read on the caller's thread, the kernel's first. If a source fails, only its own channels are
// missing: the caller gets an error and a set. Samples are null if a source failed and no channel was read.
//
// A subscription reads only its own channels. Files of other drivers are not read for it, except files that
// have not been read before.
class LinuxChanmeter final : public RecordChanmeter {
 public:
  // `root` is the directory of /proc and /sys; empty for the real ones. `log` and `accounts` must outlive
  // this object. What is held of published files is charged to their owners; without accounts nothing is
  // charged. The kernel's channels are not charged, because the hardware bounds them.
  LinuxChanmeter(std::string channelsDirectory, const LogCategory& log, const std::string& root = {},
                 Accounts* accounts = nullptr)
      : kernel_(root, log), published_(std::move(channelsDirectory), log, accounts) {}

  [[nodiscard]] Channels copyChannelsInGroup(const std::optional<std::string>& group,
                                             const std::optional<std::string>& subGroup,
                                             std::optional<ChanmeterError>& error) override;
  // Subscribes all given channels; never fails.
  [[nodiscard]] Subscription createSubscription(const Channels& channels, Channels& subscribed,
                                                std::optional<ChanmeterError>& error) override;
  [[nodiscard]] Samples createSamples(const Subscription& subscription, const Channels& subscribed,
                                      std::optional<ChanmeterError>& error) override;
  // Samples of one reading share what was read of published files. The kernel's files are read for each.
  [[nodiscard]] Reading beginReading() override;
  [[nodiscard]] Samples createSamplesIn(const Reading& reading, const Subscription& subscription,
                                        const Channels& subscribed,
                                        std::optional<ChanmeterError>& error) override;

 private:
  ChanmeterRecords read(const ChannelChoice& choice, PublishedChannels::Reading& reading,
                        PublishedChannels::Selection* selection, std::optional<ChanmeterError>& failure);

  KernelSoundChannels kernel_;
  PublishedChannels published_;
};

}  // namespace tonewerk
