// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "platform/linux/channels/ChannelChoice.h"
#include "values/Mutex.h"

namespace tonewerk {

// Makes channels from the kernel's status files of sound cards. The driver is the card's identifier, such as
// "PCH".
//
//   group            subgroup     channel            format   unit
//   Tx (playback)    pcm0 sub0    Hardware Position  simple   frames   since the substream was prepared
//   Rx (capture)                  Delay              simple   frames
//                                 State              state    ms       in its present state only
//   Speaker          none         Power              state    ms       active and suspended, since the start
//
// The kernel does not count transitions, so these are 0. A substream that no process has open has the
// position 0 and the delay 0. A card without power management has no Power channel.
//
// A channel that has not changed since the last reading gives the same record object again, so that the
// snapshots of many sessions share it.
//
// Any thread.
class KernelSoundChannels {
 public:
  static constexpr std::size_t kMaxSubstreams = 256;  // of all cards together; further ones are left out
  static constexpr std::size_t kMaxKept = 4 * kMaxSubstreams;  // records; beyond that, all are dropped

  // `root` is the directory of /proc/asound and /sys/class/sound; empty for the real ones. `log` must outlive
  // this object.
  KernelSoundChannels(const std::string& root, const LogCategory& log)
      : cards_(root + "/proc/asound"), devices_(root + "/sys/class/sound"), log_(log) {}

  // Appends the current records of the chosen channels: for each card its power, its playback substreams and
  // its capture substreams. A card that is removed meanwhile gives no records. A file in an unexpected form
  // is left out and logged once. It sets `error`, unless that is set already.
  void read(const ChannelChoice& choice, ChanmeterRecords& records, std::optional<ChanmeterError>& error);

 private:
  // The arguments and the state of one call of read().
  struct Reading {
    const ChannelChoice& choice;
    ChanmeterRecords& records;
    std::optional<ChanmeterError>& error;
    std::size_t substreams = 0;
  };

  std::set<int> cardNumbers() const;
  std::string identifierOf(int card) const;
  void readPower(Reading& reading, const std::string& driver, const std::string& directory);
  void readSubstreams(Reading& reading, const std::string& driver, const std::string& card, char direction);
  void readSubstream(Reading& reading, ChanmeterKey key, const std::string& directory);
  void addIfChosen(Reading& reading, ChanmeterRecord record);
  std::shared_ptr<const ChanmeterRecord> shared(ChanmeterRecord record);
  void reportProblem(Reading& reading, std::int64_t code, const std::string& path, std::string_view what);

  const std::string cards_;
  const std::string devices_;
  const LogCategory& log_;
  Mutex mutex_;
  // The paths that were logged, at most kMaxSubstreams.
  std::set<std::string> loggedPaths_ GUARDED_BY(mutex_);
  // The last record of each channel, at most kMaxKept.
  std::map<ChanmeterKey, std::shared_ptr<const ChanmeterRecord>> latest_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
