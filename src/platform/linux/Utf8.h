// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tonewerk {

// The length of the character at the start of `text`, which is not empty; 0 when no well-formed one is there.
std::size_t utf8CharacterLength(std::string_view text);

// Whether `text` is well-formed UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF. Zero bytes
// are text.
bool isUtf8(std::string_view text);

// `text` with U+FFFD for what is no UTF-8: one for each byte that begins no character, and one for the
// beginning of a character that goes no further. For texts that others choose and nobody has checked, where
// they come in: what keeps and sends reports takes no other texts.
std::string validUtf8(std::string text);

}  // namespace tonewerk
