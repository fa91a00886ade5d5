// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <cmath>
#include <gtest/gtest.h>
#include <random>
#include <rapidcheck.h>
#include <rapidcheck/gtest.h>

#include "platform/chanmeter/ChanmeterDifference.h"
#include "support/ChannelRecords.h"
#include "support/ValueGenerators.h"

// Tests properties of the difference of any records, and compares it with a slow and simple computation.

namespace tonewerk {
namespace {

using namespace channels;

std::uint64_t sinceStart(std::uint64_t later, std::uint64_t earlier) {
  return later < earlier ? later : later - earlier;
}

// Hits in the generated records are not negative, and their differences do not overflow.
std::int64_t hitsSinceStart(std::int64_t later, std::int64_t earlier) {
  return later < earlier ? later : later - earlier;
}

rc::Gen<std::optional<std::string>> name() {
  return rc::gen::element<std::optional<std::string>>(std::nullopt, "a", "b", "c", "");
}

rc::Gen<ChanmeterRecord> record() {
  const auto state = rc::gen::apply(
      [](std::string text, std::uint64_t transitions, std::uint64_t residency) {
        return ChanmeterState{std::move(text), transitions, residency, 0.5};
      },
      rc::gen::element<std::string>("on", "off", "idle", ""), generate::unsignedInteger(),
      generate::unsignedInteger());
  const auto bound = rc::gen::element<std::optional<std::int64_t>>(std::nullopt, -5, 0, 10);
  const auto bucket = rc::gen::apply(
      [](std::optional<std::int64_t> lower, std::optional<std::int64_t> upper, std::int64_t hits) {
        return ChanmeterBucket{lower, upper, hits};
      },
      bound, bound, rc::gen::inRange<std::int64_t>(0, std::numeric_limits<std::int64_t>::max()));
  return rc::gen::apply(
      [](std::optional<std::string> group, std::optional<std::string> subGroup,
         std::optional<std::string> channel, int format, std::int64_t value, std::vector<ChanmeterState> held,
         std::vector<ChanmeterBucket> buckets) {
        return ChanmeterRecord{.key = {.driver = "Amp",
                                       .group = std::move(group),
                                       .subGroup = std::move(subGroup),
                                       .name = std::move(channel)},
                               .format = static_cast<ChanmeterFormat>(format),
                               .value = value,
                               .states = std::move(held),
                               .buckets = std::move(buckets)};
      },
      name(), name(), name(), rc::gen::inRange(0, 6), generate::integer(),
      rc::gen::container<std::vector<ChanmeterState>>(state),
      rc::gen::container<std::vector<ChanmeterBucket>>(bucket));
}

std::vector<ChanmeterRecord> anyRecords() {
  return *rc::gen::container<std::vector<ChanmeterRecord>>(record());
}

// Finds the later records' counterparts by comparing all pairs, and uses each earlier record once.
template <typename T, typename Same>
std::vector<const T*> slowCounterparts(const std::vector<T>& earlier, const std::vector<T>& later,
                                       const Same& same) {
  std::vector<bool> taken(earlier.size(), false);
  std::vector<const T*> found;
  for (const T& item : later) {
    const T* match = nullptr;
    for (std::size_t i = 0; i < earlier.size() && match == nullptr; ++i) {
      if (taken[i] || !same(earlier[i], item)) continue;
      taken[i] = true;
      match = &earlier[i];
    }
    found.push_back(match);
  }
  return found;
}

bool sameChannel(const ChanmeterRecord& a, const ChanmeterRecord& b) {
  return a.key == b.key && a.format == b.format;
}

void checkStates(const ChanmeterRecord& earlier, const ChanmeterRecord& later,
                 const ChanmeterRecord& change) {
  RC_ASSERT(change.states.size() == later.states.size());
  const auto before =
      slowCounterparts(earlier.states, later.states,
                       [](const ChanmeterState& a, const ChanmeterState& b) { return a.name == b.name; });
  double shares = 0;
  for (std::size_t i = 0; i < later.states.size(); ++i) {
    const ChanmeterState base = before[i] == nullptr ? ChanmeterState{} : *before[i];
    RC_ASSERT(change.states[i].name == later.states[i].name);
    RC_ASSERT(change.states[i].transitions == sinceStart(later.states[i].transitions, base.transitions));
    RC_ASSERT(change.states[i].residency == sinceStart(later.states[i].residency, base.residency));
    RC_ASSERT((change.states[i].dutyCycle == 0) == (change.states[i].residency == 0));
    shares += change.states[i].dutyCycle;
  }
  RC_ASSERT(shares == 0 || std::abs(shares - 1) < 1e-9);
}

void checkBuckets(const ChanmeterRecord& earlier, const ChanmeterRecord& later,
                  const ChanmeterRecord& change) {
  RC_ASSERT(change.buckets.size() == later.buckets.size());
  const auto before = slowCounterparts(earlier.buckets, later.buckets,
                                       [](const ChanmeterBucket& a, const ChanmeterBucket& b) {
                                         return a.lower == b.lower && a.upper == b.upper;
                                       });
  for (std::size_t i = 0; i < later.buckets.size(); ++i) {
    const std::int64_t base = before[i] == nullptr ? 0 : before[i]->hits;
    RC_ASSERT(change.buckets[i].lower == later.buckets[i].lower);
    RC_ASSERT(change.buckets[i].upper == later.buckets[i].upper);
    RC_ASSERT(change.buckets[i].hits == hitsSinceStart(later.buckets[i].hits, base));
  }
}

RC_GTEST_PROP(ChanmeterDifferenceProperties, IsThatOfTheSlowestWay, ()) {
  const std::vector<ChanmeterRecord> earlier = anyRecords();
  const std::vector<ChanmeterRecord> later = anyRecords();
  const std::vector<ChanmeterRecord> changes = plain(chanmeterDifference(shared(earlier), shared(later)));

  const auto before = slowCounterparts(earlier, later, sameChannel);
  std::size_t next = 0;
  for (std::size_t i = 0; i < later.size(); ++i) {
    if (before[i] == nullptr) continue;
    RC_ASSERT(next < changes.size());
    const ChanmeterRecord& change = changes[next++];
    RC_ASSERT(sameChannel(change, later[i]));
    if (change.format == kChanmeterFormatState) checkStates(*before[i], later[i], change);
    if (change.format == kChanmeterFormatHistogram) checkBuckets(*before[i], later[i], change);
    if (change.format == kChanmeterFormatSimple) {
      const long double exact = static_cast<long double>(later[i].value) - before[i]->value;
      RC_ASSERT(static_cast<long double>(change.value) ==
                std::clamp<long double>(exact, -0x1p63L, 0x1p63L - 1));
    }
  }
  RC_ASSERT(next == changes.size());
}

RC_GTEST_PROP(ChanmeterDifferenceProperties, OfRecordsWithThemselvesIsZeroEverywhere, ()) {
  const std::vector<ChanmeterRecord> records = anyRecords();
  const std::vector<ChanmeterRecord> changes = plain(chanmeterDifference(shared(records), shared(records)));
  RC_ASSERT(changes.size() == records.size());
  for (const ChanmeterRecord& change : changes) {
    if (change.format == kChanmeterFormatSimple) RC_ASSERT(change.value == 0);
    if (change.format == kChanmeterFormatState) {
      for (const ChanmeterState& state : change.states) {
        RC_ASSERT(state.transitions == 0U);
        RC_ASSERT(state.residency == 0U);
        RC_ASSERT(state.dutyCycle == 0);
      }
    }
    if (change.format == kChanmeterFormatHistogram) {
      for (const ChanmeterBucket& bucket : change.buckets) RC_ASSERT(bucket.hits == 0);
    }
  }
}

RC_GTEST_PROP(ChanmeterDifferenceProperties, DoesNotDependOnTheEarlierOrder, ()) {
  // For channels with one name the order matters.
  const std::vector<ChanmeterRecord> earlier = *rc::gen::uniqueBy<std::vector<ChanmeterRecord>>(
      record(), [](const ChanmeterRecord& one) { return std::make_pair(one.key, one.format); });
  const ChanmeterRecords later = shared(anyRecords());
  ChanmeterRecords shuffled = shared(earlier);
  std::shuffle(shuffled.begin(), shuffled.end(), std::mt19937(*rc::gen::arbitrary<unsigned>()));
  RC_ASSERT(plain(chanmeterDifference(shuffled, later)) ==
            plain(chanmeterDifference(shared(earlier), later)));
}

}  // namespace
}  // namespace tonewerk
