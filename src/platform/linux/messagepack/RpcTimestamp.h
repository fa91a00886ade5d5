// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Date.h"

namespace tonewerk {

// MessagePack's timestamp extension: nanoseconds and seconds since 1970 in 4, 8 or 12 bytes.
inline constexpr int kTimestampExtension = -1;

// None for any other length and for more than 999,999,999 nanoseconds.
[[nodiscard]] std::optional<Date> dateOfTimestamp(std::string_view body);

// The shortest form that holds `date`, rounded to the nearest nanosecond. A date outside the range of 64-bit
// seconds becomes the nearest one inside, NaN the start of 1970.
std::string timestampOf(Date date);

}  // namespace tonewerk
