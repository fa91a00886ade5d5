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

// What the kernel itself says of sound cards, as channels. The driver is the card's identifier, as "PCH".
//
//   group            subgroup     channel            format   unit
//   Tx (playback)    pcm0 sub0    Hardware Position  simple   frames   since the substream was prepared
//   Rx (capture)                  Delay              simple   frames
//                                 State              state    ms       in its present state, no other
//   Speaker          none         Power              state    ms       active and suspended, since the start
//
// The kernel counts no transitions, so these are 0. A substream that nobody has open is at position 0 with no
// delay. A card without power management has no Power.
//
// A channel that did not change since it was last read gives the same record again, so that the snapshots of
// many sessions share it.
//
// Any thread.
class KernelSoundChannels {
 public:
  static constexpr std::size_t kMaxSubstreams = 256;  // of all cards together; the others are left out
  static constexpr std::size_t kMaxKept = 4 * kMaxSubstreams;  // records; past them all are forgotten

  // Below `root` are /proc/asound and /sys/class/sound; empty for the real ones. `log` outlives this.
  KernelSoundChannels(const std::string& root, const LogCategory& log)
      : cards_(root + "/proc/asound"), devices_(root + "/sys/class/sound"), log_(log) {}

  // Appends the chosen channels' current records: card by card, each with its power, its playback and its
  // capture substreams. A card that goes meanwhile gives nothing. What has another form than expected is left
  // out, becomes `error` if there is none, and is logged once.
  void read(const ChannelChoice& choice, ChanmeterRecords& records, std::optional<ChanmeterError>& error);

 private:
  // One reading.
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
  void complain(Reading& reading, std::int64_t code, const std::string& path, std::string_view what);

  const std::string cards_;
  const std::string devices_;
  const LogCategory& log_;
  Mutex mutex_;
  // The paths that were logged, at most kMaxSubstreams.
  std::set<std::string> complaints_ GUARDED_BY(mutex_);
  // At most kMaxKept.
  std::map<ChanmeterKey, std::shared_ptr<const ChanmeterRecord>> latest_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
