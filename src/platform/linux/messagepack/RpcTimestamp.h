// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Date.h"

namespace tonewerk {

// MessagePack's timestamp extension: nanoseconds and seconds since 1970 in 4, 8 or 12 bytes.
inline constexpr int kTimestampExtension = -1;

// None for another length and for more than 999,999,999 nanoseconds.
[[nodiscard]] std::optional<Date> dateOfTimestamp(std::string_view body);

// The shortest form that holds `date`, to the nearest nanosecond. What seconds in 64 bits cannot say becomes
// the nearest that they can, NaN 1970.
std::string timestampOf(Date date);

}  // namespace tonewerk
