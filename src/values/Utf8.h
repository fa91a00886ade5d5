// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tonewerk {

// The length of the character at the start of `text`, which is not empty; 0 when no well-formed one is there.
std::size_t utf8CharacterLength(std::string_view text);

// Whether `byte` goes on with a character that another one begins.
inline bool isUtf8Continuation(char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U; }

// The characters of `text`: of each sequence the first byte counts, also where it is not well-formed.
std::size_t utf8Characters(std::string_view text);

// Whether `text` is well-formed UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF. Zero bytes
// are text.
bool isUtf8(std::string_view text);

// The same, and none of Unicode's 66 noncharacters (U+FDD0 to U+FDEF, and U+xFFFE and U+xFFFF of every
// plane): what clients may say. The D-Bus library takes no others, and what is text does not depend on the
// way that it comes.
bool isText(std::string_view text);

// `text` with U+FFFD for what isText() does not take: one for each byte that begins no character, one for the
// beginning of a character that goes no further, and one for a noncharacter. For texts that others choose and
// nobody has checked, where they come in: what keeps and sends reports takes no other texts.
std::string validUtf8(std::string text);

}  // namespace tonewerk
