// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/PackedMapReader.h"

#include <algorithm>
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
// A number, a boolean or a text of up to 31 bytes takes at most so many bytes.
constexpr std::size_t kMaxShortValue = 32;
// How far copies of values may write behind them.
constexpr std::size_t kOvershoot = kMaxShortValue;

// How many bytes such a value takes, by its first byte; 0 for any other value.
constexpr std::array<std::uint8_t, 256> shortLengths() {
  std::array<std::uint8_t, 256> lengths = encoding::kNumberLengths;
  for (std::size_t size = 0; size < kMaxShortValue; ++size)
    lengths[encoding::kFixedText + size] = static_cast<std::uint8_t>(1 + size);
  return lengths;
}
constexpr std::array<std::uint8_t, 256> kShortLengths = shortLengths();
// The deepest value lies in the frame's array, that of the arguments, the map, and an array or a map inside.
static_assert(kMaxFrameDepth >= 4);

// Checks values, one after the other. After the first problem it stands still.
class Checker {
 public:
  explicit Checker(std::string_view bytes) : at_(bytes.data()), end_(bytes.data() + bytes.size()) {}

  const char* at() const { return at_; }
  std::string_view rest() const { return {at_, left()}; }
  // Goes to a place behind whole keys and values that need no check.
  void goTo(const char* at) { at_ = at; }
  bool isAtEnd() const { return at_ == end_; }
  // The word for a value that the protocol does not allow; null when there was none.
  const char* refused() const { return refused_; }

  // Read the start of a map and of an array. None after a problem.
  std::optional<std::size_t> count() {
    const bool isShort = !isAtEnd() && (byteAt(at_) & 0xE0U) == encoding::kFixedMap;
    return isShort ? byteAt(at_++) & 0x0FU : longCount();
  }
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
  std::optional<std::size_t> longCount();
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

std::optional<std::size_t> Checker::longCount() {
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

// Copies some bytes more instead of exactly `size` where so many may be read, which takes less time.
void copyShort(char* to, const char* from, std::size_t size, std::size_t readable) {
  constexpr std::size_t kHalf = kMaxShortValue / 2;
  if (readable < (size > kHalf ? kMaxShortValue : kHalf)) {
    copyBytes(to, from, size);
    return;
  }
  std::memcpy(to, from, kHalf);
  if (size > kHalf) std::memcpy(to + kHalf, from + kHalf, kHalf);
}

// How far a map is packed.
struct Progress {
  std::size_t missing;  // entries
  ShapeTable::Place place = ShapeTable::root();
  char* end;  // of the values
};

// Packs entries while their keys are short and known, and their values short and, if they are texts, ASCII.
// Nearly all entries are. Behind the checked bytes, so many others are `readable`.
void packUsual(Checker& checker, ShapeTable& shapes, std::size_t readable, Progress& progress) {
  Progress now = progress;
  std::string_view bytes = checker.rest();
  for (; now.missing > 0; --now.missing) {
    ShapeTable::Place place = now.place;
    const std::size_t keySize = shapes.walk(place, bytes);
    if (keySize == 0 || keySize == bytes.size()) break;
    const char* const value = bytes.data() + keySize;
    const std::size_t left = bytes.size() - keySize;
    const std::uint8_t first = byteAt(value);
    const std::size_t size = kShortLengths[first];
    if (size == 0 || size > left) break;
    if ((first & 0xE0U) == encoding::kFixedText && !isAscii({value + 1, size - 1})) break;
    copyShort(now.end, value, size, left + readable);
    now.end += size;
    now.place = place;
    bytes = {value + size, left - size};
  }
  checker.goTo(bytes.data());
  progress = now;
}

}  // namespace

PackedMapReader::Read PackedMapReader::read(std::string_view bytes, ShapeTable& shapes,
                                            const PackedMapHints& hints, PackedChunk* chunk) {
  Read read = pack(bytes, shapes, hints, chunk);
  if (values_.size() > kKeptBytes) values_ = {};
  return read;
}

PackedMapReader::Read PackedMapReader::pack(std::string_view bytes, ShapeTable& shapes,
                                            const PackedMapHints& hints, PackedChunk* chunk) {
  Checker checker(bytes);
  const auto stopped = [&] {
    const bool isRefused = checker.refused() != nullptr;
    return Read{isRefused ? Result::kRefused : Result::kTree, {}, isRefused ? checker.refused() : ""};
  };
  if (bytes.empty() || !encoding::isMap(byteAt(bytes.data()))) return {};
  const std::optional<std::size_t> entries = checker.count();
  if (!entries) return {};
  if (values_.size() < bytes.size() + kOvershoot) values_.resize(bytes.size() + kOvershoot);
  if (const RecentMaps::Map* recent = recent_.find(hints.kind, shapes)) {
    if (const auto values = packLike(*recent, bytes, hints.readable))
      return {Result::kPacked, ValueMap(PackedMap::make(*recent->shape, *values, chunk)), ""};
  }
  Progress progress{.missing = *entries, .end = values_.data()};
  for (;; --progress.missing) {
    packUsual(checker, shapes, hints.readable, progress);
    if (progress.missing == 0) break;
    std::optional<std::string_view> key = checker.shortKey();
    if (!key) key = checker.key();
    if (!key) return stopped();
    ShapeTable::Place next = shapes.find(progress.place, *key);
    if (next == ShapeTable::none()) {
      if (!checker.isValidKey(*key)) return stopped();
      next = shapes.add(progress.place, *key);
      if (next == ShapeTable::none()) return {};
    }
    progress.place = next;
    const char* const value = checker.at();
    if (!checker.shortValue() && !checker.value()) return stopped();
    progress.end = copyBytes(progress.end, value, static_cast<std::size_t>(checker.at() - value));
  }
  if (!checker.isAtEnd()) return {};
  const Shape* shape = shapes.shapeAt(progress.place);
  if (shape == nullptr || shape->hasDoubledKey()) return {};
  const std::string_view values(values_.data(), static_cast<std::size_t>(progress.end - values_.data()));
  recent_.offer(hints.kind, shapes, bytes, *shape, values);
  return {Result::kPacked, ValueMap(PackedMap::make(*shape, values, chunk)), ""};
}

std::optional<std::string_view> PackedMapReader::packLike(const RecentMaps::Map& recent,
                                                          std::string_view bytes, std::size_t readable) {
  const char* const before = recent.bytes.data();
  const RecentMaps::Entry* entry = recent.entries.data();
  const RecentMaps::Entry* const last = entry + recent.entries.size();
  Checker checker(bytes);
  char* to = values_.data();
  std::size_t at = 0;      // in the recent map: up to here all is done
  std::size_t packed = 0;  // up to here its values are
  for (;;) {
    const std::size_t left = recent.bytes.size() - at;
    const std::size_t same =
        at + commonBytes(checker.at(), before + at, std::min(left, checker.rest().size()));
    const RecentMaps::Entry* const first = entry;
    while (entry != last && entry->end <= same) ++entry;
    if (entry != first) {
      const RecentMaps::Entry& done = entry[-1];
      to = copyBytes(to, recent.values.data() + packed, done.packedEnd - packed);
      checker.goTo(checker.at() + (done.end - at));
      at = done.end;
      packed = done.packedEnd;
    }
    if (entry == last) break;
    if (same < entry->value) return std::nullopt;  // another key, or the end
    checker.goTo(checker.at() + (entry->value - at));
    const char* const value = checker.at();
    if (!checker.shortValue() && !checker.value()) return std::nullopt;
    const auto size = static_cast<std::size_t>(checker.at() - value);
    if (size <= kMaxShortValue) {
      copyShort(to, value, size, checker.rest().size() + size + readable);
    } else {
      copyBytes(to, value, size);
    }
    to += size;
    at = entry->end;
    packed = entry->packedEnd;
    ++entry;
  }
  if (!checker.isAtEnd()) return std::nullopt;
  return std::string_view(values_.data(), static_cast<std::size_t>(to - values_.data()));
}

}  // namespace tonewerk
