// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Holds the keys of channels, each once.
class ChanmeterChannelSet final : public ChanmeterChannels {
 public:
  explicit ChanmeterChannelSet(std::vector<ChanmeterKey> keys);
  // Takes the channels of `records`.
  explicit ChanmeterChannelSet(const ChanmeterRecords& records);

  // Sorted in ascending order.
  const std::vector<ChanmeterKey>& keys() const { return keys_; }
  // O(log n); faster when no channel of the set is in the key's group.
  bool contains(const ChanmeterKey& key) const;
  // Returns the records of these channels, in the order of `records`.
  ChanmeterRecords selectedFrom(const ChanmeterRecords& records) const;

 private:
  std::vector<ChanmeterKey> keys_;
  std::vector<std::optional<std::string>> groups_;  // of the keys; ascending, each once
};

// Returns those of `records` that are in that group and subgroup, in their order. None stands for all groups
// or subgroups.
ChanmeterRecords chanmeterRecordsIn(const ChanmeterRecords& records, const std::optional<std::string>& group,
                                    const std::optional<std::string>& subGroup);

}  // namespace tonewerk
