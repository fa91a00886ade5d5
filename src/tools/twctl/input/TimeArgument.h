// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

namespace tonewerk {

// Reads a time as people type it, and returns seconds since 1970. The text is RFC 3339
// ("2026-11-20T10:18:00Z", "2026-11-20T11:18:00.5+01:00"), or a time span before `now` (seconds since 1970):
// a number with s, m, h or d, such as "90s", "10m", "1.5h", "2d". None for any other text.
[[nodiscard]] std::optional<double> timeOfArgument(std::string_view text, double now);

}  // namespace tonewerk
