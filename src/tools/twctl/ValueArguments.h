// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "session/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

// What people type on the command line as values.

// `true`, `false`, a number, or else the text itself.
Value valueOfArgument(std::string_view text);

// "KEY=VALUE"; none without a key or an "=".
std::optional<ValueMapEntry> entryOfArgument(std::string_view text);

// "Playback", "HAL_Playback", "Unknown" or a number; none for anything else.
std::optional<AudioEventCategory> categoryOfArgument(std::string_view text);

// "Start", "Unknown" or a number; none for anything else.
std::optional<AudioEventType> typeOfArgument(std::string_view text);

// What is wrong with a session's identifier; empty when it is a decimal number of 64 bits with a sign. For
// options that are read into a ReporterID: their own reading takes a number that is too large for the largest
// there is.
std::string problemWithReporterID(const std::string& text);

}  // namespace tonewerk
