// SPDX-License-Identifier: Apache-2.0
#include "values/CompactJson.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <utility>

#include "values/Bytes.h"
#include "values/Decimal.h"
#include "values/PackedMap.h"
#include "values/Shape.h"

namespace tonewerk {
namespace {

bool isPlain(char c) { return static_cast<unsigned char>(c) >= 0x20 && c != '"' && c != '\\'; }

// Checks eight characters at once. Also false when one of them is not ASCII.
bool arePlain(std::uint64_t eight) {
  constexpr std::uint64_t kOnes = 0x0101010101010101U;
  constexpr std::uint64_t kHighs = kOnes * 0x80;
  // Sets the high bit of each byte that is zero; it may also set it in bytes above such a byte.
  const auto zeroes = [](std::uint64_t bytes) { return (bytes - kOnes) & ~bytes; };
  const std::uint64_t controls = eight - kOnes * 0x20;
  return ((eight | controls | zeroes(eight ^ kOnes * '"') | zeroes(eight ^ kOnes * '\\')) & kHighs) == 0;
}

// Returns whether nothing in `text` must be escaped. May be false for text that is not ASCII.
bool isPlain(std::string_view text) {
  const char* at = text.data();
  if (text.size() >= sizeof(std::uint64_t)) {
    const char* const last = at + text.size() - sizeof(std::uint64_t);
    for (; at < last; at += sizeof(std::uint64_t)) {
      if (!arePlain(loadAt<std::uint64_t>(at))) return false;
    }
    return arePlain(loadAt<std::uint64_t>(last));
  }
  if (text.size() >= sizeof(std::uint32_t)) {
    const std::uint64_t first = loadAt<std::uint32_t>(at);
    return arePlain(first << 32U | loadAt<std::uint32_t>(at + text.size() - sizeof(std::uint32_t)));
  }
  return std::all_of(text.begin(), text.end(), [](char c) { return isPlain(c); });
}

// Returns the position of the next character, from `at` on, that must be escaped; the text's size when there
// is none.
std::size_t endOfPlain(std::string_view text, std::size_t at) {
  const auto end = std::find_if_not(text.begin() + static_cast<std::ptrdiff_t>(at), text.end(),
                                    [](char c) { return isPlain(c); });
  return static_cast<std::size_t>(end - text.begin());
}

// Collects a text in small pieces, which a string would take more slowly, and appends it to a string.
class Pieces {
 public:
  explicit Pieces(std::string& out) : out_(out) {}
  Pieces(const Pieces&) = delete;
  Pieces& operator=(const Pieces&) = delete;
  ~Pieces() { flush(); }

  // Returns a place for at most kMostAtOnce characters; advance() tells how many have been written there.
  static constexpr std::size_t kMostAtOnce = 64;
  char* room() {
    if (kMostAtOnce > static_cast<std::size_t>(buffer_.data() + buffer_.size() - end_)) flush();
    return end_;
  }
  void advance(const char* end) { end_ = buffer_.data() + (end - buffer_.data()); }

  void add(char c) {
    *room() = c;
    ++end_;
  }
  void add(std::string_view text) {
    if (text.size() <= kMostAtOnce) {
      end_ = copyBytes(room(), text.data(), text.size());
    } else {
      flush();
      out_ += text;
    }
  }

  void addQuoted(std::string_view text) {
    if (text.size() > kMostAtOnce - 2) {
      add('"');
      add(text);
      return add('"');
    }
    char* const at = room();
    *at = '"';
    end_ = copyBytes(at + 1, text.data(), text.size());
    *end_++ = '"';
  }

 private:
  void flush() {
    out_.append(buffer_.data(), end_);
    end_ = buffer_.data();
  }

  std::string& out_;
  std::array<char, 1024> buffer_;  // not set to zero, which would take as long as the text
  char* end_ = buffer_.data();
};

class JsonWriter {
 public:
  explicit JsonWriter(std::string& out) : out_(out) {}

  void value(const Value& value);
  void value(EncodedValue value);
  void map(const ValueMap& map);
  void mapWithout(const ValueMap& map, std::string_view hidden);
  void text(std::string_view text);

 private:
  void scalar(const Value& value);
  void number(bool value) { out_.add(value ? "true" : "false"); }
  void number(double number);
  template <std::integral Integer>
  void number(Integer number);
  void escaped(unsigned char c);
  void packed(const PackedMap& map);

  Pieces out_;
};

template <std::integral Integer>
void JsonWriter::number(Integer number) {
  char* const at = out_.room();
  out_.advance(std::to_chars(at, at + Pieces::kMostAtOnce, number).ptr);
}

void JsonWriter::number(double number) {
  if (!std::isfinite(number)) return out_.add("null");
  char* const at = out_.room();
  char* end = digitsOf(number, at);
  const bool hasPointOrExponent = std::trunc(number) != number || std::fabs(number) >= 1e16;
  if (!hasPointOrExponent) end = copyBytes(end, ".0", 2);
  out_.advance(end);
}

void JsonWriter::escaped(unsigned char c) {
  constexpr char kHex[] = "0123456789abcdef";
  switch (c) {
    case '"':
      return out_.add("\\\"");
    case '\\':
      return out_.add("\\\\");
    case '\b':
      return out_.add("\\b");
    case '\f':
      return out_.add("\\f");
    case '\n':
      return out_.add("\\n");
    case '\r':
      return out_.add("\\r");
    case '\t':
      return out_.add("\\t");
    default:
      break;
  }
  out_.add("\\u00");
  out_.add(kHex[c >> 4U]);
  out_.add(kHex[c & 15U]);
}

void JsonWriter::text(std::string_view text) {
  if (isPlain(text)) return out_.addQuoted(text);
  out_.add('"');
  for (std::size_t at = 0;;) {
    const std::size_t end = endOfPlain(text, at);
    out_.add(text.substr(at, end - at));
    if (end == text.size()) break;
    escaped(static_cast<unsigned char>(text[end]));
    at = end + 1;
  }
  out_.add('"');
}

void JsonWriter::scalar(const Value& value) {
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

void JsonWriter::value(const Value& value) {
  if (const SharedString* held = value.asString()) return text(*held);
  if (const ValueMap* held = value.asMap()) return map(*held);
  const ValueArray* array = value.asArray();
  if (array == nullptr) return scalar(value);
  out_.add('[');
  for (const Value& element : *array) {
    if (&element != array->begin()) out_.add(',');
    this->value(element);
  }
  out_.add(']');
}

void JsonWriter::value(EncodedValue value) {
  if (value.isNumber()) return encoding::visitNumber(value.begin(), [&](auto held) { number(held); });
  if (value.isText()) return text(value.text());
  const Value::Kind kind = value.kind();
  const char* separator = "";
  if (kind == Value::Kind::kArray) {
    out_.add('[');
    forEachElement(value, [&](EncodedValue element) {
      out_.add(std::exchange(separator, ","));
      this->value(element);
    });
    out_.add(']');
  } else if (kind == Value::Kind::kMap) {
    out_.add('{');
    forEachEntry(value, [&](std::string_view key, EncodedValue held) {
      out_.add(std::exchange(separator, ","));
      text(key);
      out_.add(':');
      this->value(held);
    });
    out_.add('}');
  } else {
    scalar(value.scalar());
  }
}

void JsonWriter::packed(const PackedMap& map) {
  out_.add('{');
  map.forEach([&](std::size_t slot, EncodedValue held) {
    const std::string_view key = map.shape().json(slot);
    out_.add(slot == 0 ? key.substr(1) : key);  // without the comma
    value(held);
  });
  out_.add('}');
}

void JsonWriter::map(const ValueMap& map) {
  if (const PackedMap* held = map.packed()) return packed(*held);
  out_.add('{');
  for (const ValueMap::Entry& entry : map) {
    if (&entry != map.begin()) out_.add(',');
    text(entry.key);
    out_.add(':');
    value(entry.value);
  }
  out_.add('}');
}

void JsonWriter::mapWithout(const ValueMap& map, std::string_view hidden) {
  out_.add('{');
  bool isFirst = true;
  const auto separate = [&] {
    if (!std::exchange(isFirst, false)) out_.add(',');
  };
  if (const PackedMap* held = map.packed()) {
    const Shape& shape = held->shape();
    held->forEach([&, hiddenSlot = shape.find(hidden)](std::size_t slot, EncodedValue entry) {
      if (slot == hiddenSlot) return;
      separate();
      out_.add(shape.json(slot).substr(1));  // without the comma
      value(entry);
    });
  } else {
    for (const ValueMap::Entry& entry : map) {
      if (entry.key.view() == hidden) continue;
      separate();
      text(entry.key);
      out_.add(':');
      value(entry.value);
    }
  }
  out_.add('}');
}

}  // namespace

void appendCompactJson(std::string& out, ValueView value) {
  JsonWriter writer(out);
  if (value.encoded()) {
    writer.value(value.encoded());
  } else {
    writer.value(*value.held());
  }
}

void appendCompactJson(std::string& out, const ValueMap& map) { JsonWriter(out).map(map); }

void appendCompactJson(std::string& out, const ValueMap& map, std::string_view hidden) {
  if (hidden.empty() || !map.contains(hidden)) return appendCompactJson(out, map);
  JsonWriter(out).mapWithout(map, hidden);
}

void appendJsonText(std::string& out, std::string_view text) { JsonWriter(out).text(text); }

}  // namespace tonewerk
