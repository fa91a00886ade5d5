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

// How long a trace's intervals took, in nanoseconds, by signpost, in the order in which they ended.
using TraceIntervals = std::map<std::string, std::vector<std::uint64_t>, std::less<>>;

// Reads what tw-trace-reader writes. None when it is anything else or not all of it; `problem` then says why,
// in the reader's own words when it has some.
[[nodiscard]] std::optional<TraceIntervals> parseTraceIntervals(std::string_view text, std::string& problem);

}  // namespace tonewerk
