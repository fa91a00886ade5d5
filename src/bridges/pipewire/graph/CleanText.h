// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tonewerk {

// A process in the graph may choose texts of any length and any bytes. The reporting daemon gets at most this
// many bytes of each, as valid UTF-8.
inline constexpr std::size_t kMaxTextBytes = 256;

// Returns `text` with U+FFFD in place of invalid UTF-8 and '?' in place of each control character, cut before
// the character that would exceed kMaxTextBytes.
std::string cleanText(std::string_view text);

}  // namespace tonewerk
