// SPDX-License-Identifier: Apache-2.0
#include "values/Utf8.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tonewerk {
namespace {

constexpr std::string_view kReplacement = "\xEF\xBF\xBD";  // U+FFFD

std::uint8_t byteAt(std::string_view text, std::size_t at) { return static_cast<std::uint8_t>(text[at]); }

// Returns how many bytes a character has whose first byte is `first`; 0 when no character begins with it.
std::size_t announcedLength(std::uint8_t first) {
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first <= 0xDF) return 2;
  if (first >= 0xE0 && first <= 0xEF) return 3;
  if (first >= 0xF0 && first <= 0xF4) return 4;
  return 0;
}

// The second byte shows overlong forms, surrogates and code points beyond U+10FFFF.
bool mayFollow(std::uint8_t first, std::uint8_t second) {
  const std::uint8_t minimum = first == 0xE0 ? 0xA0 : first == 0xF0 ? 0x90 : 0x80;
  const std::uint8_t maximum = first == 0xED ? 0x9F : first == 0xF4 ? 0x8F : 0xBF;
  return second >= minimum && second <= maximum;
}

// Returns how many bytes at the start of `text` are a character, or may be the beginning of one; at least 1.
std::size_t matchingBytes(std::string_view text, std::size_t announced) {
  std::size_t count = 1;
  while (count < announced && count < text.size()) {
    const bool matches =
        count == 1 ? mayFollow(byteAt(text, 0), byteAt(text, count)) : isUtf8Continuation(text[count]);
    if (!matches) break;
    ++count;
  }
  return count;
}

// Takes a well-formed sequence. The noncharacters are U+FDD0 to U+FDEF and the last two of every plane.
bool isNoncharacter(std::string_view sequence) {
  if (sequence.size() < 3) return false;
  const std::size_t last = sequence.size() - 1;
  const bool endsPlane = byteAt(sequence, last - 1) == 0xBF && byteAt(sequence, last) >= 0xBE;
  if (sequence.size() == 4) return endsPlane && (byteAt(sequence, 1) & 0x0FU) == 0x0FU;
  if (byteAt(sequence, 0) != 0xEF) return false;
  return endsPlane ||
         (byteAt(sequence, 1) == 0xB7 && byteAt(sequence, 2) >= 0x90 && byteAt(sequence, 2) <= 0xAF);
}

enum class Noncharacters { kTaken, kRefused };

// Returns how many bytes at the start of `text` are well-formed and, where noncharacters are refused, contain
// none.
std::size_t validBytes(std::string_view text, Noncharacters noncharacters) {
  std::size_t at = 0;
  while (at < text.size()) {
    // Nearly all text is ASCII: skip eight bytes at a time while no high bit is set.
    std::uint64_t word = 0;
    if (text.size() - at >= sizeof(word)) {
      std::memcpy(&word, text.data() + at, sizeof(word));
      if ((word & 0x8080808080808080U) == 0) {
        at += sizeof(word);
        continue;
      }
    }
    if (byteAt(text, at) < 0x80) {
      ++at;
      continue;
    }
    const std::size_t length = utf8CharacterLength(text.substr(at));
    if (length == 0) break;
    if (noncharacters == Noncharacters::kRefused && isNoncharacter(text.substr(at, length))) break;
    at += length;
  }
  return at;
}

}  // namespace

std::size_t utf8CharacterLength(std::string_view text) {
  const std::size_t announced = announcedLength(byteAt(text, 0));
  return announced > 0 && matchingBytes(text, announced) == announced ? announced : 0;
}

std::size_t utf8Characters(std::string_view text) {
  return text.size() - static_cast<std::size_t>(std::count_if(text.begin(), text.end(), isUtf8Continuation));
}

bool isUtf8(std::string_view text) { return validBytes(text, Noncharacters::kTaken) == text.size(); }

bool isText(std::string_view text) { return validBytes(text, Noncharacters::kRefused) == text.size(); }

std::string validUtf8(std::string text) {
  std::string_view rest = text;
  std::size_t valid = validBytes(rest, Noncharacters::kRefused);
  if (valid == rest.size()) return text;
  std::string repaired;
  repaired.reserve(text.size() + kReplacement.size());
  while (valid < rest.size()) {
    repaired += rest.substr(0, valid);
    repaired += kReplacement;
    rest.remove_prefix(valid);
    rest.remove_prefix(matchingBytes(rest, announcedLength(byteAt(rest, 0))));
    valid = validBytes(rest, Noncharacters::kRefused);
  }
  repaired += rest;
  return repaired;
}

}  // namespace tonewerk
