// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "values/Bytes.h"

namespace tonewerk {

// Returns whether `text` has only characters up to U+007F, as nearly all text. Quick for short texts.
inline bool isAscii(std::string_view text) {
  const char* at = text.data();
  std::uint64_t seen = 0;
  if (text.size() >= sizeof(std::uint64_t)) {
    const char* const last = at + text.size() - sizeof(std::uint64_t);
    for (; at < last; at += sizeof(std::uint64_t)) seen |= loadAt<std::uint64_t>(at);
    seen |= loadAt<std::uint64_t>(last);
  } else if (text.size() >= sizeof(std::uint32_t)) {
    seen = loadAt<std::uint32_t>(at) | loadAt<std::uint32_t>(at + text.size() - sizeof(std::uint32_t));
  } else {
    for (const char c : text) seen |= static_cast<unsigned char>(c);
  }
  return (seen & 0x8080808080808080U) == 0;
}

// Returns the length in bytes of the character at the start of `text`, which must not be empty; 0 when no
// well-formed character is there.
std::size_t utf8CharacterLength(std::string_view text);

// Returns whether `byte` continues a character that an earlier byte begins.
inline bool isUtf8Continuation(char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U; }

// Returns the number of characters in `text`. It counts the first byte of each sequence, also where the text
// is not well-formed.
std::size_t utf8Characters(std::string_view text);

// Returns whether `text` is well-formed UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF. Zero
// bytes are allowed.
bool isUtf8(std::string_view text);

// Returns whether `text` is UTF-8 that clients may send: isUtf8(), without Unicode's 66 noncharacters (U+FDD0
// to U+FDEF, and U+xFFFE and U+xFFFF of every plane). The D-Bus library refuses noncharacters, and the same
// rule applies to every transport.
bool isText(std::string_view text);

// Returns `text` with U+FFFD in place of everything that isText() refuses: one for each byte that begins no
// character, one for an incomplete character, one for a noncharacter. Call it where unchecked text from other
// programs comes in; the code that stores and sends reports accepts no other text.
std::string validUtf8(std::string text);

}  // namespace tonewerk
