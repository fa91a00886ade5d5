// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Channels by what they are known by, each once.
class ChanmeterChannelSet final : public ChanmeterChannels {
 public:
  explicit ChanmeterChannelSet(std::vector<ChanmeterKey> keys);
  // Those of `records`.
  explicit ChanmeterChannelSet(const ChanmeterRecords& records);

  // Ascending.
  const std::vector<ChanmeterKey>& keys() const { return keys_; }
  // O(log n); less for one of a group that none of these is in.
  bool contains(const ChanmeterKey& key) const;
  // The records of these channels, in their order.
  ChanmeterRecords selectedFrom(const ChanmeterRecords& records) const;

 private:
  std::vector<ChanmeterKey> keys_;
  std::vector<std::optional<std::string>> groups_;  // of the keys, ascending, each once
};

// Those of `records` that are in that group and subgroup, each of them none for all; in their order.
ChanmeterRecords chanmeterRecordsIn(const ChanmeterRecords& records, const std::optional<std::string>& group,
                                    const std::optional<std::string>& subGroup);

}  // namespace tonewerk
