// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "values/Bytes.h"
#include "values/Value.h"

namespace tonewerk {

namespace encoding {

// The first byte of a value in MessagePack. Numbers, counts and lengths that follow it are big-endian.
enum Byte : std::uint8_t {
  kFixedMap = 0x80,
  kFixedArray = 0x90,
  kFixedText = 0xA0,
  kNil = 0xC0,
  kReserved,
  kFalse,
  kTrue,
  kBinary8,
  kBinary16,
  kBinary32,
  kExtension8,
  kExtension16,
  kExtension32,
  kFloat32,
  kFloat64,
  kUnsigned8,
  kUnsigned16,
  kUnsigned32,
  kUnsigned64,
  kSigned8,
  kSigned16,
  kSigned32,
  kSigned64,
  kExtensionOf1,
  kExtensionOf2,
  kExtensionOf4,
  kExtensionOf8,
  kExtensionOf16,
  kText8,
  kText16,
  kText32,
  kArray16,
  kArray32,
  kMap16,
  kMap32,
  kFixedNegative,
};

// The extension's type that stands for a date.
inline constexpr std::int8_t kTimestamp = -1;

// How many bytes a value takes, by its first byte; 0 when that depends on the bytes after it.
constexpr std::array<std::uint8_t, 256> fixedLengths() {
  std::array<std::uint8_t, 256> lengths{};
  for (std::size_t byte = 0; byte < kFixedMap; ++byte) lengths[byte] = 1;
  for (std::size_t size = 0; size < 32; ++size)
    lengths[kFixedText + size] = static_cast<std::uint8_t>(1 + size);
  for (std::size_t byte = kFixedNegative; byte < lengths.size(); ++byte) lengths[byte] = 1;
  for (const Byte byte : {kNil, kFalse, kTrue}) lengths[byte] = 1;
  for (const Byte byte : {kUnsigned8, kSigned8}) lengths[byte] = 2;
  for (const Byte byte : {kUnsigned16, kSigned16}) lengths[byte] = 3;
  for (const Byte byte : {kUnsigned32, kSigned32, kFloat32}) lengths[byte] = 5;
  for (const Byte byte : {kUnsigned64, kSigned64, kFloat64}) lengths[byte] = 9;
  for (std::size_t power = 0; power < 5; ++power)
    lengths[kExtensionOf1 + power] = static_cast<std::uint8_t>(2 + (1U << power));
  return lengths;
}
inline constexpr std::array<std::uint8_t, 256> kFixedLengths = fixedLengths();

inline std::uint8_t byteAt(const char* at) { return static_cast<std::uint8_t>(*at); }

// Header and body of a text, of binary data or of an extension; header and number of elements of an array or
// a map.
struct Extent {
  std::size_t header = 0;
  std::size_t count = 0;
};
// Takes any text, binary data, extension, array or map. An extension's header includes its type.
Extent extentAt(const char* at);
// Returns how long a header is that begins with `first`.
std::size_t headerLength(std::uint8_t first);

inline bool isText(std::uint8_t first) {
  return (first & 0xE0U) == kFixedText || (first >= kText8 && first <= kText32);
}
inline bool isArray(std::uint8_t first) {
  return (first & 0xF0U) == kFixedArray || first == kArray16 || first == kArray32;
}
inline bool isMap(std::uint8_t first) {
  return (first & 0xF0U) == kFixedMap || first == kMap16 || first == kMap32;
}
inline bool isExtension(std::uint8_t first) {
  return (first >= kExtension8 && first <= kExtension32) ||
         (first >= kExtensionOf1 && first <= kExtensionOf16);
}
inline bool isBinary(std::uint8_t first) { return first >= kBinary8 && first <= kBinary32; }

// How many bytes a number or a boolean takes, by its first byte; 0 for any other value.
constexpr std::array<std::uint8_t, 256> numberLengths() {
  std::array<std::uint8_t, 256> lengths = fixedLengths();
  for (std::size_t byte = kFixedMap; byte <= kReserved; ++byte) lengths[byte] = 0;
  for (std::size_t byte = kExtensionOf1; byte <= kExtensionOf16; ++byte) lengths[byte] = 0;
  return lengths;
}
inline constexpr std::array<std::uint8_t, 256> kNumberLengths = numberLengths();

// Calls visit() with the number or the boolean: a bool, an int64_t, a uint64_t above its range, or a double.
template <typename Visitor>
decltype(auto) visitNumber(const char* at, Visitor&& visit) {
  const std::uint8_t first = byteAt(at);
  switch (first) {
    case kFalse:
    case kTrue:
      return visit(first == kTrue);
    case kFloat32:
      return visit(static_cast<double>(std::bit_cast<float>(bigEndianAt<std::uint32_t>(at + 1))));
    case kFloat64:
      return visit(std::bit_cast<double>(bigEndianAt<std::uint64_t>(at + 1)));
    case kUnsigned8:
      return visit(std::int64_t{bigEndianAt<std::uint8_t>(at + 1)});
    case kUnsigned16:
      return visit(std::int64_t{bigEndianAt<std::uint16_t>(at + 1)});
    case kUnsigned32:
      return visit(std::int64_t{bigEndianAt<std::uint32_t>(at + 1)});
    case kUnsigned64: {
      const auto number = bigEndianAt<std::uint64_t>(at + 1);
      return number >> 63U == 0 ? visit(static_cast<std::int64_t>(number)) : visit(number);
    }
    case kSigned8:
      return visit(std::int64_t{static_cast<std::int8_t>(bigEndianAt<std::uint8_t>(at + 1))});
    case kSigned16:
      return visit(std::int64_t{static_cast<std::int16_t>(bigEndianAt<std::uint16_t>(at + 1))});
    case kSigned32:
      return visit(std::int64_t{static_cast<std::int32_t>(bigEndianAt<std::uint32_t>(at + 1))});
    case kSigned64:
      return visit(static_cast<std::int64_t>(bigEndianAt<std::uint64_t>(at + 1)));
    default:
      return visit(std::int64_t{static_cast<std::int8_t>(first)});  // a small integer is its own first byte
  }
}

// Reads the body of a timestamp: seconds in 4 bytes, both parts in 8, nanoseconds and seconds in 12. None for
// another length and for more than 999,999,999 nanoseconds.
std::optional<Date> dateOf(std::string_view body);

}  // namespace encoding

// Refers to one value that is encoded in MessagePack, or to none. Reading it allocates nothing; it has the
// values, conversions and text form of the Value that it stands for.
//
// The bytes are trusted: somebody has checked that they are one whole value of the kinds that Value has, with
// UTF-8 texts, and with maps whose keys are texts and differ.
class EncodedValue {
 public:
  EncodedValue() = default;
  explicit EncodedValue(const char* bytes) : at_(bytes) {}

  explicit operator bool() const { return at_ != nullptr; }
  const char* begin() const { return at_; }
  const char* end() const {
    const std::size_t length = encoding::kFixedLengths[first()];
    return length != 0 ? at_ + length : endOfLong();
  }
  std::string_view bytes() const { return {at_, static_cast<std::size_t>(end() - at_)}; }

  Value::Kind kind() const;
  bool isText() const { return encoding::isText(first()); }
  // True for a number and for a boolean.
  bool isNumber() const { return encoding::kNumberLengths[first()] != 0; }
  // Only for a text.
  std::string_view text() const {
    const std::uint8_t byte = first();
    if ((byte & 0xE0U) == encoding::kFixedText) return {at_ + 1, byte & 0x1FU};
    const encoding::Extent extent = encoding::extentAt(at_);
    return {at_ + extent.header, extent.count};
  }
  // The value itself when it is a boolean, a number or a date. An array or a map converts to what an empty
  // one converts to, which is returned for them. Not for texts.
  Value scalar() const;
  // Allocates for texts, arrays and maps.
  Value value() const;

  friend bool operator==(EncodedValue a, EncodedValue b);

 private:
  std::uint8_t first() const { return encoding::byteAt(at_); }
  const char* endOfLong() const;

  const char* at_ = nullptr;
};

// Calls visit(EncodedValue) for each element of an array.
template <typename Visitor>
void forEachElement(EncodedValue array, Visitor&& visit) {
  const encoding::Extent extent = encoding::extentAt(array.begin());
  const char* at = array.begin() + extent.header;
  for (std::size_t left = extent.count; left > 0; --left) {
    const EncodedValue element(at);
    visit(element);
    at = element.end();
  }
}

// Calls visit(key, EncodedValue) for each entry of a map.
template <typename Visitor>
void forEachEntry(EncodedValue map, Visitor&& visit) {
  const encoding::Extent extent = encoding::extentAt(map.begin());
  const char* at = map.begin() + extent.header;
  for (std::size_t left = extent.count; left > 0; --left) {
    const EncodedValue key(at);
    const EncodedValue value(key.end());
    visit(key.text(), value);
    at = value.end();
  }
}

// Appends `value` in its shortest form. Only booleans, numbers and texts: a date has finer steps than its
// encoded form. Returns false, and appends nothing, for the others.
[[nodiscard]] bool appendEncoded(std::string& out, const Value& value);

}  // namespace tonewerk
