// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/PackedMapReader.h"

#include <array>
#include <cstdint>
#include <cstring>
#include <optional>
#include <utility>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcTimestamp.h"
#include "values/Bytes.h"
#include "values/EncodedValue.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

using encoding::byteAt;

// The room for values that is kept from one map to the next.
constexpr std::size_t kKeptBytes = std::size_t{64} * 1024;
// How far copyValue() may write behind a value.
constexpr std::size_t kOvershoot = 16;
// The deepest value lies in the frame's array, that of the arguments, the map, and an array or a map inside.
static_assert(kMaxFrameDepth >= 4);

// Checks values, one after the other. After the first problem it stands still.
class Checker {
 public:
  explicit Checker(std::string_view bytes) : at_(bytes.data()), end_(bytes.data() + bytes.size()) {}

  const char* at() const { return at_; }
  bool isAtEnd() const { return at_ == end_; }
  // The word for a value that the protocol does not allow; null when there was none.
  const char* refused() const { return refused_; }

  // Read the start of a map and of an array. None after a problem.
  std::optional<std::size_t> count();
  // Returns the next key without a check of its characters. None when it is no text, and after a problem.
  std::optional<std::string_view> key();
  // Checks that a key's characters are allowed.
  bool isValidKey(std::string_view key);
  // The same for a key of less than 32 bytes, as most are; none for any other, and behind the last byte.
  std::optional<std::string_view> shortKey() {
    if (isAtEnd()) return std::nullopt;
    const std::uint8_t first = byteAt(at_);
    const std::size_t size = first & 0x1FU;
    if ((first & 0xE0U) != encoding::kFixedText || size >= left()) return std::nullopt;
    const std::string_view key(at_ + 1, size);
    at_ += 1 + size;
    return key;
  }
  // Goes behind the next value. False after a problem, and for an array or a map that is left to a tree.
  bool value();
  // Goes behind a number, a boolean or a short ASCII text, as most values are; false for any other value, and
  // behind the last byte.
  bool shortValue() {
    if (isAtEnd()) return false;
    const std::uint8_t first = byteAt(at_);
    const std::size_t number = encoding::kNumberLengths[first];
    const bool isShortText = (first & 0xE0U) == encoding::kFixedText;
    const std::size_t length = isShortText ? 1 + (first & 0x1FU) : number;
    if (length == 0 || length > left()) return false;
    if (isShortText && !isAscii({at_ + 1, length - 1})) return false;
    at_ += length;
    return true;
  }

 private:
  std::size_t left() const { return static_cast<std::size_t>(end_ - at_); }
  bool refuse(const char* what) {
    refused_ = what;
    return false;
  }
  // Returns the body of a text or an extension, and goes behind it.
  std::optional<std::string_view> body();
  // The same for a text, most of which are short.
  std::optional<std::string_view> textBody();
  // The same as value(), but for no array and no map.
  bool leaf();
  bool text();
  bool extension();
  bool array();
  bool map();

  const char* at_;
  const char* const end_;
  const char* refused_ = nullptr;
};

std::optional<std::size_t> Checker::count() {
  if (isAtEnd() || encoding::headerLength(byteAt(at_)) > left()) return std::nullopt;
  const encoding::Extent extent = encoding::extentAt(at_);
  at_ += extent.header;
  return extent.count;
}

std::optional<std::string_view> Checker::body() {
  if (isAtEnd() || encoding::headerLength(byteAt(at_)) > left()) return std::nullopt;
  const encoding::Extent extent = encoding::extentAt(at_);
  if (extent.count > left() - extent.header) return std::nullopt;
  const std::string_view body(at_ + extent.header, extent.count);
  at_ += extent.header + extent.count;
  return body;
}

std::optional<std::string_view> Checker::textBody() {
  const std::uint8_t first = byteAt(at_);
  if ((first & 0xE0U) != encoding::kFixedText) return body();
  const std::size_t size = first & 0x1FU;
  if (size >= left()) return std::nullopt;
  const std::string_view body(at_ + 1, size);
  at_ += 1 + size;
  return body;
}

std::optional<std::string_view> Checker::key() {
  if (isAtEnd()) return std::nullopt;
  const std::uint8_t first = byteAt(at_);
  if (encoding::isText(first)) return textBody();
  // An array or a map has problems of its own, which come first.
  if (!encoding::isArray(first) && !encoding::isMap(first) && leaf()) refuse("has a key that is not a text");
  return std::nullopt;
}

bool Checker::isValidKey(std::string_view key) {
  if (isText(key)) return true;
  return refuse(isUtf8(key) ? "has a key with a noncharacter" : "has a key that is not UTF-8");
}

bool Checker::value() {
  if (isAtEnd()) return false;
  const std::uint8_t first = byteAt(at_);
  if (encoding::isArray(first)) return array();
  if (encoding::isMap(first)) return map();
  return leaf();
}

bool Checker::leaf() {
  if (isAtEnd()) return false;
  const std::uint8_t first = byteAt(at_);
  if (const std::size_t length = encoding::kNumberLengths[first]) {
    if (length > left()) return false;
    at_ += length;
    return true;
  }
  if (encoding::isText(first)) return text();
  if (encoding::isExtension(first)) return extension();
  if (encoding::isBinary(first)) return refuse("holds binary data");
  return first == encoding::kNil && refuse("holds nil");
}

bool Checker::text() {
  const std::optional<std::string_view> text = textBody();
  if (!text) return false;
  if (isAscii(*text) || isText(*text)) return true;
  return refuse(isUtf8(*text) ? "holds text with a noncharacter" : "holds text that is not UTF-8");
}

bool Checker::extension() {
  const std::optional<std::string_view> extension = body();
  if (!extension) return false;
  const auto type = static_cast<signed char>(*(extension->data() - 1));
  if (type != kTimestampExtension) return refuse("holds an extension other than a date");
  return dateOfTimestamp(*extension) || refuse("holds a malformed date");
}

bool Checker::array() {
  const std::optional<std::size_t> elements = count();
  if (!elements || *elements > PackedMapReader::kMaxNestedElements) return false;
  for (std::size_t left = *elements; left > 0; --left) {
    if (!leaf()) return false;
  }
  return true;
}

bool Checker::map() {
  const std::optional<std::size_t> entries = count();
  if (!entries || *entries > PackedMapReader::kMaxNestedKeys) return false;
  std::array<std::string_view, PackedMapReader::kMaxNestedKeys> keys;
  for (std::size_t place = 0; place < *entries; ++place) {
    const std::optional<std::string_view> next = key();
    if (!next || !isValidKey(*next)) return false;
    for (std::size_t earlier = 0; earlier < place; ++earlier) {
      if (keys[earlier] == *next) return false;
    }
    keys[place] = *next;
    if (!leaf()) return false;
  }
  return true;
}

// Most values are short: copies some bytes more instead of exactly `size`, where `from` in `bytes` has them.
char* copyValue(char* to, const char* from, std::size_t size, std::string_view bytes) {
  if (size <= kOvershoot && static_cast<std::size_t>(bytes.data() + bytes.size() - from) >= kOvershoot) {
    std::memcpy(to, from, kOvershoot);
    return to + size;
  }
  return copyBytes(to, from, size);
}

}  // namespace

PackedMapReader::Read PackedMapReader::read(std::string_view bytes, ShapeTable& shapes, PackedChunk* chunk) {
  Read read = pack(bytes, shapes, chunk);
  if (values_.size() > kKeptBytes) values_ = {};
  return read;
}

PackedMapReader::Read PackedMapReader::pack(std::string_view bytes, ShapeTable& shapes, PackedChunk* chunk) {
  Checker checker(bytes);
  const auto stopped = [&] {
    const bool isRefused = checker.refused() != nullptr;
    return Read{isRefused ? Result::kRefused : Result::kTree, {}, isRefused ? checker.refused() : ""};
  };
  if (bytes.empty() || !encoding::isMap(byteAt(bytes.data()))) return {};
  const std::optional<std::size_t> entries = checker.count();
  if (!entries) return {};
  if (values_.size() < bytes.size() + kOvershoot) values_.resize(bytes.size() + kOvershoot);
  char* end = values_.data();
  ShapeTable::Place place = ShapeTable::root();
  for (std::size_t left = *entries; left > 0; --left) {
    std::optional<std::string_view> key = checker.shortKey();
    if (!key) key = checker.key();
    if (!key) return stopped();
    ShapeTable::Place next = shapes.find(place, *key);
    if (next == ShapeTable::none()) {
      if (!checker.isValidKey(*key)) return stopped();
      next = shapes.add(place, *key);
      if (next == ShapeTable::none()) return {};
    }
    place = next;
    const char* const value = checker.at();
    if (!checker.shortValue() && !checker.value()) return stopped();
    end = copyValue(end, value, static_cast<std::size_t>(checker.at() - value), bytes);
  }
  if (!checker.isAtEnd()) return {};
  const Shape* shape = shapes.shapeAt(place);
  if (shape == nullptr || shape->hasDoubledKey()) return {};
  const std::string_view values(values_.data(), static_cast<std::size_t>(end - values_.data()));
  return {Result::kPacked, ValueMap(PackedMap::make(*shape, values, chunk)), ""};
}

}  // namespace tonewerk
