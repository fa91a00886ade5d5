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

// A session as the daemon has described it, with its rate of messages.
struct SessionRow {
  ValueMap session;
  std::optional<double> messagesPerSecond;  // none without an earlier listing
  std::optional<double> redundantShare;     // of all its messages, 0 to 1; none without messages
};

// Computes rates from successive listings of the daemon's sessions.
class SessionRates {
 public:
  // `listing` was taken at `now`, in seconds of a monotonic clock. Returns the busiest session first, then by
  // identifier. A session that is new since the previous listing, or was stopped in between, has received all
  // its messages since then.
  std::vector<SessionRow> rowsOf(const std::vector<ValueMap>& listing, double now);

 private:
  // Process, session, and a number: a process may have the same session on two connections.
  using Key = std::tuple<std::int64_t, std::int64_t, std::size_t>;
  using Counts = std::map<Key, std::uint64_t>;

  std::optional<double> rateOf(const Key& key, std::uint64_t count, double now) const;

  Counts earlier_;
  std::optional<double> earlierAt_;
};

}  // namespace tonewerk
