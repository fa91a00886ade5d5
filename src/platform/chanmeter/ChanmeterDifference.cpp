// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterDifference.h"

#include <limits>
#include <tuple>

#include "platform/chanmeter/Counterparts.h"
#include "platform/chanmeter/DutyCycles.h"

namespace tonewerk {
namespace {

std::int64_t saturatingDifference(std::int64_t later, std::int64_t earlier) {
  using Limits = std::numeric_limits<std::int64_t>;
  if (earlier < 0 && later > Limits::max() + earlier) return Limits::max();
  if (earlier > 0 && later < Limits::min() + earlier) return Limits::min();
  return later - earlier;
}

// A counter that went back restarted from zero.
std::uint64_t counterDifference(std::uint64_t later, std::uint64_t earlier) {
  return later >= earlier ? later - earlier : later;
}

std::int64_t counterDifference(std::int64_t later, std::int64_t earlier) {
  return later >= earlier ? saturatingDifference(later, earlier) : later;
}

void subtractStates(std::vector<ChanmeterState>& states, const std::vector<ChanmeterState>& earlier) {
  const auto before = counterparts(
      earlier, states, [](const ChanmeterState& state) -> const std::string& { return state.name; });
  for (std::size_t i = 0; i < states.size(); ++i) {
    if (before[i] == nullptr) continue;
    states[i].transitions = counterDifference(states[i].transitions, before[i]->transitions);
    states[i].residency = counterDifference(states[i].residency, before[i]->residency);
  }
  computeDutyCycles(states);
}

void subtractBuckets(std::vector<ChanmeterBucket>& buckets, const std::vector<ChanmeterBucket>& earlier) {
  const auto before = counterparts(
      earlier, buckets, [](const ChanmeterBucket& bucket) { return std::tie(bucket.lower, bucket.upper); });
  for (std::size_t i = 0; i < buckets.size(); ++i) {
    if (before[i] != nullptr) buckets[i].hits = counterDifference(buckets[i].hits, before[i]->hits);
  }
}

bool hasDifference(const ChanmeterRecord& record) {
  return record.format >= kChanmeterFormatSimple && record.format <= kChanmeterFormatHistogram;
}

void subtract(ChanmeterRecord& change, const ChanmeterRecord& earlier) {
  if (change.format == kChanmeterFormatSimple)
    change.value = saturatingDifference(change.value, earlier.value);
  if (change.format == kChanmeterFormatState) subtractStates(change.states, earlier.states);
  if (change.format == kChanmeterFormatHistogram) subtractBuckets(change.buckets, earlier.buckets);
}

}  // namespace

ChanmeterRecords chanmeterDifference(const ChanmeterRecords& earlier, const ChanmeterRecords& later) {
  const auto before = counterparts(earlier, later, [](const std::shared_ptr<const ChanmeterRecord>& record) {
    return std::tie(record->key, record->format);
  });
  // All changes are in one allocation, which each of them keeps alive.
  const auto all = std::make_shared<std::vector<ChanmeterRecord>>();
  all->reserve(later.size());
  ChanmeterRecords changes;
  changes.reserve(later.size());
  for (std::size_t i = 0; i < later.size(); ++i) {
    if (before[i] == nullptr) continue;
    if (hasDifference(*later[i])) {
      ChanmeterRecord& change = all->emplace_back(*later[i]);
      subtract(change, **before[i]);
      changes.emplace_back(all, &change);
    } else {
      changes.push_back(later[i]);
    }
  }
  return changes;
}

}  // namespace tonewerk
