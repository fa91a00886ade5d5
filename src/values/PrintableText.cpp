// SPDX-License-Identifier: Apache-2.0
#include "values/PrintableText.h"

#include <cstddef>
#include <cstdint>
#include <utility>

#include "values/Bytes.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

using CodePoint = std::uint32_t;

constexpr bool isWithin(CodePoint first, CodePoint point, CodePoint last) {
  return point >= first && point <= last;
}

constexpr bool mustBeEscaped(CodePoint point) {
  if (point < 0x20 || isWithin(0x7F, point, 0x9F)) return true;
  return point == 0x061C || isWithin(0x200E, point, 0x200F) || isWithin(0x2028, point, 0x202E) ||
         isWithin(0x2066, point, 0x2069);
}

// Checks eight bytes at once: whether all are ASCII and none is a control character.
bool arePlain(std::uint64_t eight) {
  constexpr std::uint64_t kOnes = 0x0101010101010101U;
  constexpr std::uint64_t kHighs = kOnes * 0x80;
  const std::uint64_t deletes = eight ^ kOnes * 0x7F;
  // Both subtractions set the high bit of each byte that is too small, and perhaps of those above.
  return ((eight | (eight - kOnes * 0x20) | ((deletes - kOnes) & ~deletes)) & kHighs) == 0;
}

// The character at the start of `text`, which is well-formed and has `length` bytes there.
CodePoint codePointAt(std::string_view text, std::size_t length) {
  const auto first = static_cast<std::uint8_t>(text[0]);
  CodePoint point = length == 1 ? first : first & (0x7FU >> length);
  for (std::size_t at = 1; at < length; ++at) {
    point = point << 6U | (static_cast<std::uint8_t>(text[at]) & 0x3FU);
  }
  return point;
}

// How many bytes at the start of `text` are UTF-8 without characters that must be escaped.
std::size_t printableBytes(std::string_view text) {
  std::size_t at = 0;
  while (at < text.size()) {
    if (text.size() - at >= sizeof(std::uint64_t) && arePlain(loadAt<std::uint64_t>(text.data() + at))) {
      at += sizeof(std::uint64_t);
      continue;
    }
    const std::string_view rest = text.substr(at);
    const std::size_t length = utf8CharacterLength(rest);
    if (length == 0 || mustBeEscaped(codePointAt(rest, length))) break;
    at += length;
  }
  return at;
}

void appendEscape(std::string& out, CodePoint point) {
  constexpr char kHex[] = "0123456789abcdef";
  switch (point) {
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      break;
  }
  out += "\\u";
  for (const unsigned shift : {12U, 8U, 4U, 0U}) out += kHex[point >> shift & 15U];
}

std::string escaped(std::string text, bool keepsLineFeeds) {
  const std::string valid = validUtf8(std::move(text));
  std::string out;
  out.reserve(valid.size() + 16);
  for (std::string_view rest = valid;;) {
    const std::size_t plain = printableBytes(rest);
    out += rest.substr(0, plain);
    rest.remove_prefix(plain);
    if (rest.empty()) return out;
    const std::size_t length = utf8CharacterLength(rest);
    if (keepsLineFeeds && rest.front() == '\n') {
      out += '\n';
    } else {
      appendEscape(out, codePointAt(rest, length));
    }
    rest.remove_prefix(length);
  }
}

}  // namespace

bool isPrintable(std::string_view text) { return printableBytes(text) == text.size(); }

std::string printable(std::string text) {
  return isPrintable(text) ? std::move(text) : escaped(std::move(text), false);
}

std::string printableLines(std::string text) {
  return isPrintable(text) ? std::move(text) : escaped(std::move(text), true);
}

}  // namespace tonewerk
