// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "protocol/AudioEvent.h"

namespace tonewerk {

// Which messages somebody wants to see. An empty list wants all.
struct MessageFilter {
  using Numbers = std::vector<std::int64_t>;

  // Of all its lists together.
  static constexpr std::size_t kMaxEntries = 4096;

  // Ascending.
  Numbers reporterIDs;
  Numbers categories;
  Numbers types;

  std::size_t size() const { return reporterIDs.size() + categories.size() + types.size(); }
  bool wants(ReporterID reporterID, AudioEventCategory category, AudioEventType type) const {
    return holds(reporterIDs, reporterID) && holds(categories, category) && holds(types, type);
  }

 private:
  static bool holds(const Numbers& wanted, std::int64_t number) {
    return wanted.empty() || std::binary_search(wanted.begin(), wanted.end(), number);
  }
};

}  // namespace tonewerk
