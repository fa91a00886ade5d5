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

// The durations of a trace's intervals in nanoseconds, by signpost, in the order in which the intervals
// ended.
using TraceIntervals = std::map<std::string, std::vector<std::uint64_t>, std::less<>>;

// Parses the output of tw-trace-reader. None if it has another form or is incomplete; `problem` then says
// why. If the reader reported a problem itself, `problem` is its text.
[[nodiscard]] std::optional<TraceIntervals> parseTraceIntervals(std::string_view text, std::string& problem);

}  // namespace tonewerk
