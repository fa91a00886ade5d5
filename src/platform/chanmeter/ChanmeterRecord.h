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

// Identifies a channel. An absent part is less than any text, and equal only to an absent part.
struct ChanmeterKey {
  std::optional<std::string> driver = {};
  std::optional<std::string> group = {};
  std::optional<std::string> subGroup = {};
  std::optional<std::string> name = {};

  // The linter mistakes the three-way comparison for one with a pointer.
  // NOLINTNEXTLINE(modernize-use-nullptr)
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

// When one bound is missing, both count as unreadable.
struct ChanmeterBucket {
  std::optional<std::int64_t> lower = {};
  std::optional<std::int64_t> upper = {};
  std::int64_t hits = 0;

  friend bool operator==(const ChanmeterBucket&, const ChanmeterBucket&) = default;
};

// Holds one channel's value at one time, or its change between two times, independent of the source. The
// format says which members are used: `value` of a simple channel, `states` of a state channel, `minimum`,
// `maximum` and `buckets` of a histogram, none of any other.
struct ChanmeterRecord {
  ChanmeterKey key = {};
  std::optional<std::string> unit = {};
  ChanmeterFormat format = kChanmeterFormatInvalid;
  std::int64_t value = 0;
  std::vector<ChanmeterState> states = {};
  std::int64_t minimum = 0;
  std::int64_t maximum = 0;
  std::vector<ChanmeterBucket> buckets = {};

  // Returns whether the channel is in that group and subgroup. None stands for all.
  bool isIn(const std::optional<std::string>& group, const std::optional<std::string>& subGroup) const;

  friend bool operator==(const ChanmeterRecord&, const ChanmeterRecord&) = default;
};

// A list of records in order. They are immutable and shared, so that many samples of an unchanged source cost
// little.
using ChanmeterRecords = std::vector<std::shared_ptr<const ChanmeterRecord>>;

}  // namespace tonewerk
