// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "protocol/AudioEvent.h"

namespace tonewerk {

// Says which messages a client wants to see. An empty list matches every value.
struct MessageFilter {
  using Numbers = std::vector<std::int64_t>;

  // The limit for all lists together.
  static constexpr std::size_t kMaxEntries = 4096;

  // Each list is sorted, ascending.
  Numbers reporterIDs;
  Numbers categories;
  Numbers types;

  std::size_t size() const { return reporterIDs.size() + categories.size() + types.size(); }
  bool wants(ReporterID reporterID, AudioEventCategory category, AudioEventType type) const {
    return matches(reporterIDs, reporterID) && matches(categories, category) && matches(types, type);
  }

 private:
  static bool matches(const Numbers& wanted, std::int64_t number) {
    return wanted.empty() || std::binary_search(wanted.begin(), wanted.end(), number);
  }
};

}  // namespace tonewerk
