// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/Utf8.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tonewerk {
namespace {

bool isContinuation(std::uint8_t byte) { return (byte & 0xC0U) == 0x80U; }

// The length of the well-formed sequence of two or more bytes at the start of `text`, 0 for none.
std::size_t sequenceLength(std::string_view text) {
  const auto byte = [&](std::size_t at) { return static_cast<std::uint8_t>(text[at]); };
  const std::uint8_t first = byte(0);
  if (text.size() < 2 || !isContinuation(byte(1))) return 0;
  const std::uint8_t second = byte(1);

  if (first >= 0xC2 && first <= 0xDF) return 2;
  if (text.size() < 3 || !isContinuation(byte(2))) return 0;
  if (first == 0xE0) return second >= 0xA0 ? 3 : 0;  // below are overlong forms
  if (first == 0xED) return second <= 0x9F ? 3 : 0;  // above are surrogates
  if (first >= 0xE1 && first <= 0xEF) return 3;
  if (text.size() < 4 || !isContinuation(byte(3))) return 0;
  if (first == 0xF0) return second >= 0x90 ? 4 : 0;  // below are overlong forms
  if (first == 0xF4) return second <= 0x8F ? 4 : 0;  // above is beyond U+10FFFF
  return first >= 0xF1 && first <= 0xF3 ? 4 : 0;
}

}  // namespace

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    // Nearly all text is ASCII: eight bytes at a time while none has its high bit set.
    std::uint64_t word = 0;
    if (text.size() >= sizeof(word)) {
      std::memcpy(&word, text.data(), sizeof(word));
      if ((word & 0x8080808080808080U) == 0) {
        text.remove_prefix(sizeof(word));
        continue;
      }
    }
    if (static_cast<std::uint8_t>(text.front()) < 0x80) {
      text.remove_prefix(1);
      continue;
    }
    const std::size_t length = sequenceLength(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

}  // namespace tonewerk
