// SPDX-License-Identifier: Apache-2.0
#include "values/JsonPieces.h"

#include <algorithm>

#include "values/Date.h"

namespace tonewerk {
namespace {

// Returns the position of the next character, from `at` on, that must be escaped; the text's size when there
// is none.
std::size_t endOfPlain(std::string_view text, std::size_t at) {
  const auto end = std::find_if_not(text.begin() + static_cast<std::ptrdiff_t>(at), text.end(),
                                    [](char c) { return json::isPlain(c); });
  return static_cast<std::size_t>(end - text.begin());
}

}  // namespace

void JsonPieces::scalar(const Value& value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return number(*value.asBoolean());
    case Value::Kind::kInteger:
      return number(*value.asInteger());
    case Value::Kind::kUnsigned:
      return number(*value.asUnsigned());
    case Value::Kind::kDouble:
      return number(*value.asDouble());
    case Value::Kind::kDate:
      return text(textOf(*value.asDate()));
    case Value::Kind::kString:
    case Value::Kind::kArray:
    case Value::Kind::kMap:
      break;
  }
}

void JsonPieces::escaped(std::string_view text) {
  add('"');
  for (std::size_t at = 0;;) {
    const std::size_t end = endOfPlain(text, at);
    add(text.substr(at, end - at));
    if (end == text.size()) break;
    escaped(static_cast<unsigned char>(text[end]));
    at = end + 1;
  }
  add('"');
}

void JsonPieces::escaped(unsigned char c) {
  constexpr char kHex[] = "0123456789abcdef";
  switch (c) {
    case '"':
      return add("\\\"");
    case '\\':
      return add("\\\\");
    case '\b':
      return add("\\b");
    case '\f':
      return add("\\f");
    case '\n':
      return add("\\n");
    case '\r':
      return add("\\r");
    case '\t':
      return add("\\t");
    default:
      break;
  }
  add("\\u00");
  add(kHex[c >> 4U]);
  add(kHex[c & 15U]);
}

}  // namespace tonewerk
