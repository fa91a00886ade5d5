// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/CleanText.h"

#include <cstdint>

namespace tonewerk {

namespace {

bool isContinuation(char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U; }

// How many bytes the lead byte announces; 0 for a byte that leads nothing.
std::size_t announcedLength(unsigned char lead) {
  if (lead < 0x80) return 1;
  if (lead >= 0xC2 && lead < 0xE0) return 2;
  if (lead >= 0xE0 && lead < 0xF0) return 3;
  if (lead >= 0xF0 && lead < 0xF5) return 4;
  return 0;
}

// Overlong forms, surrogates and what lies past U+10FFFF show in the second byte.
bool isSecondByteOf(unsigned char lead, unsigned char second) {
  if (lead == 0xE0) return second >= 0xA0;
  if (lead == 0xED) return second < 0xA0;
  if (lead == 0xF0) return second >= 0x90;
  if (lead == 0xF4) return second < 0x90;
  return true;
}

// The length of the character that `text` begins with; 0 when it begins with none.
std::size_t characterLength(std::string_view text) {
  const auto lead = static_cast<unsigned char>(text.front());
  const std::size_t length = announcedLength(lead);
  if (length == 0 || text.size() < length) return 0;
  for (std::size_t i = 1; i < length; ++i) {
    if (!isContinuation(text[i])) return 0;
  }
  return length == 1 || isSecondByteOf(lead, static_cast<unsigned char>(text[1])) ? length : 0;
}

bool isControl(char byte) { return static_cast<unsigned char>(byte) < 0x20 || byte == 0x7F; }

}  // namespace

std::string cleanText(std::string_view text) {
  std::string clean;
  while (!text.empty()) {
    const std::size_t length = characterLength(text);
    const bool keeps = length > 0 && !isControl(text.front());
    const std::string_view character = keeps ? text.substr(0, length) : std::string_view("?");
    if (clean.size() + character.size() > kMaxTextBytes) break;
    clean.append(character);
    text.remove_prefix(length == 0 ? 1 : length);
  }
  return clean;
}

}  // namespace tonewerk
