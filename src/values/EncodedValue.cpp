// SPDX-License-Identifier: Apache-2.0
#include "values/EncodedValue.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cassert>
#include <limits>
#include <span>
#include <utility>
#include <vector>

namespace tonewerk {
namespace encoding {
namespace {

constexpr std::uint64_t kNanosecondsPerSecond = 1'000'000'000;
constexpr unsigned kSecondsBits = 34;  // of the form with 8 bytes; nanoseconds have the other 30

std::optional<Date> dateOf(std::int64_t seconds, std::uint64_t nanoseconds) {
  if (nanoseconds >= kNanosecondsPerSecond) return std::nullopt;
  return Date{static_cast<double>(seconds) + static_cast<double>(nanoseconds) / 1e9};
}

}  // namespace

std::optional<Date> dateOf(std::string_view body) {
  switch (body.size()) {
    case 4:
      return dateOf(std::int64_t{bigEndianAt<std::uint32_t>(body.data())}, 0);
    case 8: {
      const auto both = bigEndianAt<std::uint64_t>(body.data());
      const std::uint64_t seconds = both & ((std::uint64_t{1} << kSecondsBits) - 1);
      return dateOf(static_cast<std::int64_t>(seconds), both >> kSecondsBits);
    }
    case 12:
      return dateOf(static_cast<std::int64_t>(bigEndianAt<std::uint64_t>(body.data() + 4)),
                    bigEndianAt<std::uint32_t>(body.data()));
    default:
      return std::nullopt;
  }
}

std::size_t headerLength(std::uint8_t first) {
  switch (first) {
    case kBinary8:
    case kText8:
    case kExtensionOf1:
    case kExtensionOf2:
    case kExtensionOf4:
    case kExtensionOf8:
    case kExtensionOf16:
      return 2;
    case kBinary16:
    case kText16:
    case kArray16:
    case kMap16:
    case kExtension8:
      return 3;
    case kExtension16:
      return 4;
    case kBinary32:
    case kText32:
    case kArray32:
    case kMap32:
      return 5;
    case kExtension32:
      return 6;
    default:
      return 1;
  }
}

Extent extentAt(const char* at) {
  const std::uint8_t first = byteAt(at);
  const std::size_t header = headerLength(first);
  switch (first) {
    case kBinary8:
    case kText8:
    case kExtension8:
      return {header, bigEndianAt<std::uint8_t>(at + 1)};
    case kBinary16:
    case kText16:
    case kArray16:
    case kMap16:
    case kExtension16:
      return {header, bigEndianAt<std::uint16_t>(at + 1)};
    case kBinary32:
    case kText32:
    case kArray32:
    case kMap32:
    case kExtension32:
      return {header, bigEndianAt<std::uint32_t>(at + 1)};
    case kExtensionOf1:
    case kExtensionOf2:
    case kExtensionOf4:
    case kExtensionOf8:
    case kExtensionOf16:
      return {header, std::size_t{1} << (first - kExtensionOf1)};
    default:
      return {header, first & (first >= kFixedText ? 0x1FU : 0x0FU)};
  }
}

}  // namespace encoding

namespace {

using namespace encoding;

Value dateAt(const char* at) {
  const Extent extent = extentAt(at);
  const std::optional<Date> date = encoding::dateOf({at + extent.header, extent.count});
  assert(date);
  return date.value_or(Date{});
}

Value arrayOf(EncodedValue array) {
  std::vector<Value> values;
  values.reserve(extentAt(array.begin()).count);
  forEachElement(array, [&](EncodedValue element) { values.push_back(element.value()); });
  return ValueArray(std::move(values));
}

Value mapOf(EncodedValue map) {
  ValueMap values;
  values.reserve(extentAt(map.begin()).count);
  forEachEntry(map, [&](std::string_view key, EncodedValue value) { values.add(key, value.value()); });
  return values;
}

bool areEqual(const char*& a, const char*& b);

bool areEqualArrays(const char*& a, const char*& b) {
  const Extent extent = extentAt(a);
  const Extent other = extentAt(b);
  if (extent.count != other.count) return false;
  a += extent.header;
  b += other.header;
  for (std::size_t left = extent.count; left > 0; --left) {
    if (!areEqual(a, b)) return false;
  }
  return true;
}

// Returns the text at `at` and goes behind it.
std::string_view readText(const char*& at) {
  const std::string_view text = EncodedValue(at).text();
  at = text.data() + text.size();
  return text;
}

struct Entry {
  std::string_view key;
  const char* value = nullptr;
};

// Up to this size, comparing with all keys is faster than sorting them.
constexpr std::size_t kMaxUnsorted = 16;

// Walks over `b` only once, because its values may be long.
bool areEqualInAnyOrder(const char*& a, const char*& b, std::size_t count) {
  std::array<Entry, kMaxUnsorted> few;
  std::vector<Entry> many(count > kMaxUnsorted ? count : 0);
  const std::span<Entry> others = many.empty() ? std::span(few).first(count) : std::span(many);
  for (Entry& entry : others) {
    entry.key = readText(b);
    entry.value = b;
    b = EncodedValue(b).end();
  }
  if (!many.empty()) std::ranges::sort(many, {}, &Entry::key);
  for (std::size_t left = count; left > 0; --left) {
    const std::string_view key = readText(a);
    const auto found = many.empty() ? std::ranges::find(others, key, &Entry::key)
                                    : std::ranges::lower_bound(others, key, {}, &Entry::key);
    if (found == others.end() || found->key != key) return false;
    const char* value = found->value;
    if (!areEqual(a, value)) return false;
  }
  return true;
}

// The keys of each map differ, so maps of one size have the same keys when one has those of the other.
bool areEqualMaps(const char*& a, const char*& b) {
  const Extent extent = extentAt(a);
  const Extent other = extentAt(b);
  if (extent.count != other.count) return false;
  a += extent.header;
  b += other.header;
  for (std::size_t left = extent.count; left > 0; --left) {
    const std::string_view key = EncodedValue(a).text();
    const std::string_view otherKey = EncodedValue(b).text();
    if (key != otherKey) return areEqualInAnyOrder(a, b, left);
    a = key.data() + key.size();
    b = otherKey.data() + otherKey.size();
    if (!areEqual(a, b)) return false;
  }
  return true;
}

// Goes behind both values when they are equal, so that nobody has to look for their ends again; else stops
// at some place inside.
bool areEqual(const char*& a, const char*& b) {
  const std::uint8_t first = byteAt(a);
  const std::uint8_t other = byteAt(b);
  if (encoding::isText(first) || encoding::isText(other))
    return encoding::isText(first) && encoding::isText(other) && readText(a) == readText(b);
  if (isArray(first) || isArray(other)) return isArray(first) && isArray(other) && areEqualArrays(a, b);
  if (isMap(first) || isMap(other)) return isMap(first) && isMap(other) && areEqualMaps(a, b);
  const EncodedValue value(a);
  const EncodedValue another(b);
  a = value.end();
  b = another.end();
  const bool areIntegers = value.isNumber() && first == other && first != kFloat32 && first != kFloat64;
  if (areIntegers) return std::equal(value.begin(), a, another.begin());  // of one form
  return value.scalar() == another.scalar();
}

void appendBigEndian(std::string& out, Byte first, std::uint64_t number, std::size_t bytes) {
  out += static_cast<char>(first);
  for (std::size_t left = bytes; left > 0; --left)
    out += static_cast<char>(number >> (8 * (left - 1)) & 0xFFU);
}

void appendUnsigned(std::string& out, std::uint64_t number) {
  if (number < kFixedMap) {
    out += static_cast<char>(number);
  } else if (number <= std::numeric_limits<std::uint8_t>::max()) {
    appendBigEndian(out, kUnsigned8, number, 1);
  } else if (number <= std::numeric_limits<std::uint16_t>::max()) {
    appendBigEndian(out, kUnsigned16, number, 2);
  } else if (number <= std::numeric_limits<std::uint32_t>::max()) {
    appendBigEndian(out, kUnsigned32, number, 4);
  } else {
    appendBigEndian(out, kUnsigned64, number, 8);
  }
}

void appendInteger(std::string& out, std::int64_t number) {
  const auto bits = static_cast<std::uint64_t>(number);
  if (number >= 0) {
    appendUnsigned(out, bits);
  } else if (number >= -32) {
    out += static_cast<char>(number);
  } else if (number >= std::numeric_limits<std::int8_t>::min()) {
    appendBigEndian(out, kSigned8, bits, 1);
  } else if (number >= std::numeric_limits<std::int16_t>::min()) {
    appendBigEndian(out, kSigned16, bits, 2);
  } else if (number >= std::numeric_limits<std::int32_t>::min()) {
    appendBigEndian(out, kSigned32, bits, 4);
  } else {
    appendBigEndian(out, kSigned64, bits, 8);
  }
}

void appendText(std::string& out, std::string_view text) {
  if (text.size() < 32) {
    out += static_cast<char>(kFixedText + text.size());
  } else if (text.size() <= std::numeric_limits<std::uint8_t>::max()) {
    appendBigEndian(out, kText8, text.size(), 1);
  } else if (text.size() <= std::numeric_limits<std::uint16_t>::max()) {
    appendBigEndian(out, kText16, text.size(), 2);
  } else {
    appendBigEndian(out, kText32, text.size(), 4);
  }
  out += text;
}

}  // namespace

const char* EncodedValue::endOfLong() const {
  const char* at = at_;
  for (std::size_t left = 1; left > 0; --left) {
    const std::uint8_t byte = byteAt(at);
    if (const std::size_t length = kFixedLengths[byte]) {
      at += length;
      continue;
    }
    const Extent extent = extentAt(at);
    at += extent.header;
    if (isArray(byte)) {
      left += extent.count;
    } else if (isMap(byte)) {
      left += 2 * extent.count;
    } else {
      at += extent.count;
    }
  }
  return at;
}

Value::Kind EncodedValue::kind() const {
  const std::uint8_t byte = first();
  if (encoding::isText(byte)) return Value::Kind::kString;
  if (isExtension(byte)) return Value::Kind::kDate;
  if (isArray(byte)) return Value::Kind::kArray;
  if (isMap(byte)) return Value::Kind::kMap;
  return scalar().kind();
}

Value EncodedValue::scalar() const {
  const std::uint8_t byte = first();
  if (isExtension(byte)) return dateAt(at_);
  if (isArray(byte)) return ValueArray();
  if (isMap(byte)) return ValueMap();
  return visitNumber(at_, [](auto number) { return Value(number); });
}

Value EncodedValue::value() const {
  const std::uint8_t byte = first();
  if (encoding::isText(byte)) return text();
  if (isArray(byte)) return arrayOf(*this);
  if (isMap(byte)) return mapOf(*this);
  return scalar();
}

bool operator==(EncodedValue a, EncodedValue b) {
  const char* at = a.begin();
  const char* other = b.begin();
  return areEqual(at, other);
}

bool appendEncoded(std::string& out, const Value& value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      out += static_cast<char>(*value.asBoolean() ? kTrue : kFalse);
      return true;
    case Value::Kind::kInteger:
      appendInteger(out, *value.asInteger());
      return true;
    case Value::Kind::kUnsigned:
      appendUnsigned(out, *value.asUnsigned());
      return true;
    case Value::Kind::kDouble:
      appendBigEndian(out, kFloat64, std::bit_cast<std::uint64_t>(*value.asDouble()), 8);
      return true;
    case Value::Kind::kString:
      appendText(out, *value.asString());
      return true;
    case Value::Kind::kDate:
    case Value::Kind::kArray:
    case Value::Kind::kMap:
      break;
  }
  return false;
}

}  // namespace tonewerk
