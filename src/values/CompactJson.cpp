// SPDX-License-Identifier: Apache-2.0
#include "values/CompactJson.h"

#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace tonewerk {
namespace {

template <typename T>
void appendDecimal(std::string& out, T number) {
  char digits[24];
  out.append(digits, std::to_chars(digits, digits + sizeof(digits), number).ptr);
}

void appendDouble(std::string& out, double number) {
  if (!std::isfinite(number)) {
    out += "null";
    return;
  }
  const std::string text = textOf(number);
  out += text;
  if (text.find_first_of(".e") == std::string::npos) out += ".0";
}

void appendEscaped(std::string& out, unsigned char c) {
  constexpr char kHex[] = "0123456789abcdef";
  switch (c) {
    case '"':
      out += "\\\"";
      return;
    case '\\':
      out += "\\\\";
      return;
    case '\b':
      out += "\\b";
      return;
    case '\f':
      out += "\\f";
      return;
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
  out += "\\u00";
  out += kHex[c >> 4];
  out += kHex[c & 15];
}

bool isPlain(char c) { return static_cast<unsigned char>(c) >= 0x20 && c != '"' && c != '\\'; }

// Checks eight characters at once. Also false when one of them is not ASCII.
bool arePlain(const char* eight) {
  constexpr std::uint64_t kOnes = 0x0101010101010101U;
  constexpr std::uint64_t kHighs = kOnes * 0x80;
  std::uint64_t word = 0;
  std::memcpy(&word, eight, sizeof(word));
  // Sets the high bit of each byte that is zero; it may also set it in bytes above such a byte.
  const auto zeroes = [](std::uint64_t bytes) { return (bytes - kOnes) & ~bytes; };
  const std::uint64_t controls = word - kOnes * 0x20;
  return ((word | controls | zeroes(word ^ kOnes * '"') | zeroes(word ^ kOnes * '\\')) & kHighs) == 0;
}

// Returns the position of the next character, from `at` on, that must be escaped; the text's size when there
// is none.
std::size_t endOfPlain(std::string_view text, std::size_t at) {
  while (at + 8 <= text.size() && arePlain(text.data() + at)) at += 8;
  while (at < text.size() && isPlain(text[at])) ++at;
  return at;
}

void appendString(std::string& out, std::string_view text) {
  out += '"';
  for (std::size_t at = 0;;) {
    const std::size_t end = endOfPlain(text, at);
    out.append(text, at, end - at);
    if (end == text.size()) break;
    appendEscaped(out, static_cast<unsigned char>(text[end]));
    at = end + 1;
  }
  out += '"';
}

}  // namespace

void appendCompactJson(std::string& out, const Value& value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      out += *value.asBoolean() ? "true" : "false";
      return;
    case Value::Kind::kInteger:
      return appendDecimal(out, *value.asInteger());
    case Value::Kind::kUnsigned:
      return appendDecimal(out, *value.asUnsigned());
    case Value::Kind::kDouble:
      return appendDouble(out, *value.asDouble());
    case Value::Kind::kString:
      return appendString(out, *value.asString());
    case Value::Kind::kDate:
      return appendString(out, textOf(*value.asDate()));
    case Value::Kind::kMap:
      return appendCompactJson(out, *value.asMap());
    case Value::Kind::kArray:
      break;
  }
  out += '[';
  for (const Value& element : *value.asArray()) {
    if (&element != value.asArray()->begin()) out += ',';
    appendCompactJson(out, element);
  }
  out += ']';
}

void appendCompactJson(std::string& out, const ValueMap& map) {
  out += '{';
  for (const ValueMap::Entry& entry : map) {
    if (&entry != map.begin()) out += ',';
    appendString(out, entry.key);
    out += ':';
    appendCompactJson(out, entry.value);
  }
  out += '}';
}

}  // namespace tonewerk
