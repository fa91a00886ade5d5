// SPDX-License-Identifier: Apache-2.0
#include "values/CompactJson.h"

#include <charconv>
#include <cmath>
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

void appendString(std::string& out, std::string_view text) {
  out += '"';
  std::size_t plainFrom = 0;
  for (std::size_t at = 0; at < text.size(); ++at) {
    const auto c = static_cast<unsigned char>(text[at]);
    if (c >= 0x20 && c != '"' && c != '\\') continue;
    out.append(text, plainFrom, at - plainFrom);
    appendEscaped(out, c);
    plainFrom = at + 1;
  }
  out.append(text, plainFrom);
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
