// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterChannelSet.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace tonewerk {
namespace {

std::vector<ChanmeterKey> keysOf(const ChanmeterRecords& records) {
  std::vector<ChanmeterKey> keys;
  keys.reserve(records.size());
  for (const auto& record : records) keys.push_back(record->key);
  return keys;
}

}  // namespace

ChanmeterChannelSet::ChanmeterChannelSet(std::vector<ChanmeterKey> keys) : keys_(std::move(keys)) {
  std::sort(keys_.begin(), keys_.end());
  keys_.erase(std::unique(keys_.begin(), keys_.end()), keys_.end());
}

ChanmeterChannelSet::ChanmeterChannelSet(const ChanmeterRecords& records)
    : ChanmeterChannelSet(keysOf(records)) {}

bool ChanmeterChannelSet::contains(const ChanmeterKey& key) const {
  return std::binary_search(keys_.begin(), keys_.end(), key);
}

ChanmeterRecords ChanmeterChannelSet::selectedFrom(const ChanmeterRecords& records) const {
  ChanmeterRecords selected;
  std::copy_if(records.begin(), records.end(), std::back_inserter(selected),
               [this](const auto& record) { return contains(record->key); });
  return selected;
}

ChanmeterRecords chanmeterRecordsIn(const ChanmeterRecords& records, const std::optional<std::string>& group,
                                    const std::optional<std::string>& subGroup) {
  ChanmeterRecords found;
  std::copy_if(records.begin(), records.end(), std::back_inserter(found),
               [&](const auto& record) { return record->isIn(group, subGroup); });
  return found;
}

}  // namespace tonewerk
