// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tonewerk {

// Any process of the graph chooses its texts, of any length and any bytes; what goes to the reporting daemon
// is text as it takes it, and short.
inline constexpr std::size_t kMaxTextBytes = 256;

// `text` with U+FFFD for what the daemon does not take for text and a '?' for each control character, cut
// before the character that would exceed kMaxTextBytes.
std::string cleanText(std::string_view text);

}  // namespace tonewerk
