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

template <typename T>
void sortAndRemoveDuplicates(std::vector<T>& items) {
  std::sort(items.begin(), items.end());
  items.erase(std::unique(items.begin(), items.end()), items.end());
}

}  // namespace

ChanmeterChannelSet::ChanmeterChannelSet(std::vector<ChanmeterKey> keys) : keys_(std::move(keys)) {
  sortAndRemoveDuplicates(keys_);
  for (const ChanmeterKey& key : keys_) {
    if (groups_.empty() || groups_.back() != key.group) groups_.push_back(key.group);
  }
  sortAndRemoveDuplicates(groups_);
}

ChanmeterChannelSet::ChanmeterChannelSet(const ChanmeterRecords& records)
    : ChanmeterChannelSet(keysOf(records)) {}

bool ChanmeterChannelSet::contains(const ChanmeterKey& key) const {
  // A reading looks up the records of every source in each set; most of them are in another group.
  return std::binary_search(groups_.begin(), groups_.end(), key.group) &&
         std::binary_search(keys_.begin(), keys_.end(), key);
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
