// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <tuple>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// A session as the daemon has described it, and what it receives.
struct SessionRow {
  ValueMap session;
  std::optional<double> messagesPerSecond;  // none as long as there is nothing to compare with
  std::optional<double> redundantShare;     // of all it has received, 0 to 1; none when that is nothing
};

// Makes rates of what the daemon says time and again.
class SessionRates {
 public:
  // `listing` was taken at `now`, in seconds of a time that never goes back. The busiest first, then by
  // identifier. A session that is new since the listing before, or was stopped in between, received all its
  // messages since then.
  std::vector<SessionRow> rowsOf(const std::vector<ValueMap>& listing, double now);

 private:
  // Process, session, and which of several of those: a process may have two connections.
  using Key = std::tuple<std::int64_t, std::int64_t, std::size_t>;
  using Counts = std::map<Key, std::uint64_t>;

  std::optional<double> rateOf(const Key& key, std::uint64_t count, double now) const;

  Counts earlier_;
  std::optional<double> earlierAt_;
};

}  // namespace tonewerk
