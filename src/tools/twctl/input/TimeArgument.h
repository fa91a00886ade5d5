// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

namespace tonewerk {

// Reads a time as people type it, and returns seconds since 1970. `now` is in seconds since 1970, too. None
// for any other text than these, which are the ones that journalctl takes:
//
//   2026-11-20T10:18:00Z       RFC 3339, with "T" or a space, fractions of a second, "Z", " UTC" or an offset
//   2026-11-20 10:18[:00]      without a zone: in the zone of this process, as all that follow
//   2026-11-20                 the begin of the day
//   10:18[:00]                 today
//   now, today, yesterday, tomorrow   the last three at midnight
//   @1795169880                seconds since 1970
//   10m, 1.5h, 2h 30min, 1 hour ago, -10m   before `now`; units from "ms" to "years", in full or short
//   +10m                       after `now`
[[nodiscard]] std::optional<double> timeOfArgument(std::string_view text, double now);

}  // namespace tonewerk
