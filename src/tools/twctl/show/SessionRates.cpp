// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/SessionRates.h"

#include <algorithm>
#include <utility>

#include "protocol/WatchKeys.h"

namespace tonewerk {

std::vector<SessionRow> SessionRates::rowsOf(const std::vector<ValueMap>& listing, double now) {
  Counts counts;
  std::vector<SessionRow> rows;
  for (const ValueMap& session : listing) {
    Key key{session.integer(kWatchKeyProcessIdentifier), session.integer(kWatchKeyReporterID), 0};
    while (counts.contains(key)) ++std::get<2>(key);
    const auto count = static_cast<std::uint64_t>(session.integer(kWatchKeyMessages));
    counts[key] = count;
    SessionRow row{session, rateOf(key, count, now), std::nullopt};
    if (count > 0) row.redundantShare = session.number(kWatchKeyRedundant) / static_cast<double>(count);
    rows.push_back(std::move(row));
  }
  earlier_ = std::move(counts);
  earlierAt_ = now;
  std::stable_sort(rows.begin(), rows.end(), [](const SessionRow& a, const SessionRow& b) {
    const double rateOfA = a.messagesPerSecond.value_or(0);
    const double rateOfB = b.messagesPerSecond.value_or(0);
    if (rateOfA != rateOfB) return rateOfA > rateOfB;
    return a.session.integer(kWatchKeyReporterID) < b.session.integer(kWatchKeyReporterID);
  });
  return rows;
}

std::optional<double> SessionRates::rateOf(const Key& key, std::uint64_t count, double now) const {
  if (!earlierAt_ || !(now > *earlierAt_)) return std::nullopt;
  const auto earlier = earlier_.find(key);
  const bool isSameRun = earlier != earlier_.end() && earlier->second <= count;
  const std::uint64_t arrived = isSameRun ? count - earlier->second : count;
  return static_cast<double>(arrived) / (now - *earlierAt_);
}

}  // namespace tonewerk
