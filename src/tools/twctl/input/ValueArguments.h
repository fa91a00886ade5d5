// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

// Reads values that people type on the command line.

// A boolean for "true" or "false", a number, otherwise the text itself.
Value valueOfArgument(std::string_view text);

// Reads "KEY=VALUE"; none without a key or without "=".
[[nodiscard]] std::optional<ValueMapEntry> entryOfArgument(std::string_view text);

// Reads "Playback", "HAL_Playback", "Unknown" or a number; none for any other text.
[[nodiscard]] std::optional<AudioEventCategory> categoryOfArgument(std::string_view text);

// Reads "Start", "Unknown" or a number; none for any other text.
[[nodiscard]] std::optional<AudioEventType> typeOfArgument(std::string_view text);

// All names that the functions above read, without Unknown; of categories also only those without a domain.
std::vector<std::string> baseCategoryNames();
std::vector<std::string> categoryNames();
std::vector<std::string> typeNames();

// Say that there is no such category or type, and which ones there are.
std::string unknownCategory(std::string_view text);
std::string unknownType(std::string_view text);

// The problem with a pattern for the names of services; empty when it has *, ? or [, or is the name of a
// service.
[[nodiscard]] std::string problemWithService(const std::string& pattern);

// The problem with a session's identifier; empty when it is a decimal number of 64 bits with a sign. For
// options that are read into a ReporterID, because the parser itself would turn a number that is too large
// into the largest one.
[[nodiscard]] std::string problemWithReporterID(const std::string& text);

// The same for a count, from 1, and for an interval in seconds, from 0.05 to 86400.
[[nodiscard]] std::string problemWithCount(const std::string& text);
[[nodiscard]] std::string problemWithSeconds(const std::string& text);

}  // namespace tonewerk
