// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <compare>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/Chanmeter.h"

namespace tonewerk {

// What a channel is known by. An absent half is less than any text, and equal to itself only.
struct ChanmeterKey {
  std::optional<std::string> driver = {};
  std::optional<std::string> group = {};
  std::optional<std::string> subGroup = {};
  std::optional<std::string> name = {};

  // The linter takes the three-way comparison for one with a pointer. NOLINTNEXTLINE(modernize-use-nullptr)
  friend auto operator<=>(const ChanmeterKey&, const ChanmeterKey&) = default;
  friend bool operator==(const ChanmeterKey&, const ChanmeterKey&) = default;
};

struct ChanmeterState {
  std::string name = {};
  std::uint64_t transitions = 0;  // into the state
  std::uint64_t residency = 0;    // in the driver's unit of time
  double dutyCycle = 0;           // share of the whole time, 0 to 1

  friend bool operator==(const ChanmeterState&, const ChanmeterState&) = default;
};

// Without one of its bounds both count as unreadable.
struct ChanmeterBucket {
  std::optional<std::int64_t> lower = {};
  std::optional<std::int64_t> upper = {};
  std::int64_t hits = 0;

  friend bool operator==(const ChanmeterBucket&, const ChanmeterBucket&) = default;
};

// One channel's value at one time, or its change between two times: plain data, whatever it was read from.
// The format says which of the values count: `value` of a simple channel, `states` of a state channel,
// `minimum`, `maximum` and `buckets` of a histogram, none of any other.
struct ChanmeterRecord {
  ChanmeterKey key = {};
  std::optional<std::string> unit = {};
  ChanmeterFormat format = kChanmeterFormatInvalid;
  std::int64_t value = 0;
  std::vector<ChanmeterState> states = {};
  std::int64_t minimum = 0;
  std::int64_t maximum = 0;
  std::vector<ChanmeterBucket> buckets = {};

  // Whether it is in that group and subgroup, each of them none for all.
  bool isIn(const std::optional<std::string>& group, const std::optional<std::string>& subGroup) const;

  friend bool operator==(const ChanmeterRecord&, const ChanmeterRecord&) = default;
};

// In order; immutable and shared, so that many samples of a source that did not change cost little.
using ChanmeterRecords = std::vector<std::shared_ptr<const ChanmeterRecord>>;

}  // namespace tonewerk
