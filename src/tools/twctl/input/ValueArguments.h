// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

// What people type on the command line as values.

// `true`, `false`, a number, or else the text itself.
Value valueOfArgument(std::string_view text);

// "KEY=VALUE"; none without a key or an "=".
[[nodiscard]] std::optional<ValueMapEntry> entryOfArgument(std::string_view text);

// "Playback", "HAL_Playback", "Unknown" or a number; none for anything else.
[[nodiscard]] std::optional<AudioEventCategory> categoryOfArgument(std::string_view text);

// "Start", "Unknown" or a number; none for anything else.
[[nodiscard]] std::optional<AudioEventType> typeOfArgument(std::string_view text);

// That there is no such category or type, and what there is instead.
std::string unknownCategory(std::string_view text);
std::string unknownType(std::string_view text);

// What is wrong with a session's identifier; empty when it is a decimal number of 64 bits with a sign. For
// options that are read into a ReporterID: their own reading takes a number that is too large for the largest
// there is.
[[nodiscard]] std::string problemWithReporterID(const std::string& text);

// The same of how many there may be, from 1, and of an interval in seconds, from 0.05 to 86400.
[[nodiscard]] std::string problemWithCount(const std::string& text);
[[nodiscard]] std::string problemWithSeconds(const std::string& text);

}  // namespace tonewerk
