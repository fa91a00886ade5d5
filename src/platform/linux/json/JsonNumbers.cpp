// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/JsonNumbers.h"

#include <algorithm>
#include <cstddef>

namespace tonewerk {
namespace {

bool isDigit(char character) { return character >= '0' && character <= '9'; }

// Returns the position after the text that begins with the quotation mark at `at`.
std::size_t endOfText(std::string_view text, std::size_t at) {
  for (++at; at < text.size() && text[at] != '"'; ++at) {
    if (text[at] == '\\') ++at;
  }
  return std::min(at + 1, text.size());
}

std::size_t endOfDigits(std::string_view text, std::size_t at) {
  while (at < text.size() && isDigit(text[at])) ++at;
  return at;
}

// Returns the position after a part of a number that needs digits, or `begin` if `at` has no digit.
std::size_t endOfPart(std::string_view text, std::size_t begin, std::size_t at) {
  const std::size_t end = endOfDigits(text, at);
  return end == at ? begin : end;
}

}  // namespace

std::vector<JsonNumber> numbersInJson(std::string_view text) {
  text = text.substr(0, text.find('\0'));
  std::vector<JsonNumber> numbers;
  for (std::size_t at = 0; at < text.size();) {
    if (text[at] == '"') {
      at = endOfText(text, at);
    } else if (text[at] == '-' || isDigit(text[at])) {
      const std::size_t size = leadingJsonNumber(text.substr(at)).size();
      numbers.push_back({static_cast<std::uint32_t>(at), static_cast<std::uint32_t>(at + size)});
      at += std::max<std::size_t>(size, 1);
    } else {
      ++at;
    }
  }
  return numbers;
}

std::string_view leadingJsonNumber(std::string_view text) {
  const std::size_t first = text.starts_with('-') ? 1 : 0;
  std::size_t end = text.substr(first).starts_with('0') ? first + 1 : endOfDigits(text, first);
  if (end == first) return {};
  if (end < text.size() && text[end] == '.') end = endOfPart(text, end, end + 1);
  if (end < text.size() && (text[end] == 'e' || text[end] == 'E')) {
    const bool hasSign = end + 1 < text.size() && (text[end + 1] == '-' || text[end + 1] == '+');
    end = endOfPart(text, end, end + (hasSign ? 2 : 1));
  }
  return text.substr(0, end);
}

}  // namespace tonewerk
