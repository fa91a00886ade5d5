// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Times are in nanoseconds.
struct TraceInterval {
  std::uint64_t duration = 0;
  std::int64_t end = 0;  // since 1970

  friend bool operator==(const TraceInterval&, const TraceInterval&) = default;
};

// A trace's intervals by signpost, in the order in which they ended.
using TraceIntervals = std::map<std::string, std::vector<TraceInterval>, std::less<>>;

// Parses the output of tw-trace-reader. None if it has another form or is incomplete; `problem` then says
// why. If the reader reported a problem itself, `problem` is its text.
[[nodiscard]] std::optional<TraceIntervals> parseTraceIntervals(std::string_view text, std::string& problem);

}  // namespace tonewerk
