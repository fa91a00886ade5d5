// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/protobuf/ProtozeroReader.h"

#include <limits>
#include <protozero/varint.hpp>

namespace tonewerk {
namespace {

constexpr std::uint32_t kTypeBits = 3;
constexpr std::uint64_t kTypeMask = 7;
constexpr std::uint64_t kLastType = 5;

}  // namespace

bool ProtozeroReader::fail() {
  hasError_ = true;
  at_ = end_;
  return false;
}

// Keys are read here because the library's message reader throws on groups.
std::optional<PB::Reader::Key> ProtozeroReader::nextKey() {
  if (hasError_ || at_ == end_) return std::nullopt;
  const auto key = readVarint();
  if (!key) return std::nullopt;
  const std::uint64_t type = *key & kTypeMask;
  const std::uint64_t tag = *key >> kTypeBits;
  if (*key > std::numeric_limits<std::uint32_t>::max() || type > kLastType || tag == 0) {
    fail();
    return std::nullopt;
  }
  return Key{static_cast<std::uint32_t>(tag), static_cast<PB::WireType>(type)};
}

std::optional<std::uint64_t> ProtozeroReader::readVarint() {
  if (hasError_) return std::nullopt;
  try {
    return protozero::decode_varint(&at_, end_);
  } catch (const protozero::exception&) {
    fail();
    return std::nullopt;
  }
}

std::optional<std::string> ProtozeroReader::readBytes() {
  const auto size = readVarint();
  const char* begin = at_;
  if (!size || !skipBytes(*size)) return std::nullopt;
  return std::string(begin, static_cast<std::size_t>(*size));
}

bool ProtozeroReader::skip(const Key& key) { return skip(key, 0); }

bool ProtozeroReader::skip(const Key& key, int groups) {
  switch (key.type) {
    case PB::WireType::kVarint:
      return readVarint().has_value();
    case PB::WireType::kFixed64:
      return skipBytes(8);
    case PB::WireType::kFixed32:
      return skipBytes(4);
    case PB::WireType::kLengthDelimited: {
      const auto size = readVarint();
      return size && skipBytes(*size);
    }
    case PB::WireType::kEndGroup:
      return fail();  // no group is open
    case PB::WireType::kStartGroup:
      break;
  }
  if (groups == kMaxGroups) return fail();
  while (const auto inner = nextKey()) {
    if (inner->type == PB::WireType::kEndGroup) return inner->tag == key.tag || fail();
    if (!skip(*inner, groups + 1)) return false;
  }
  return fail();
}

bool ProtozeroReader::skipBytes(std::uint64_t count) {
  if (hasError_ || count > static_cast<std::uint64_t>(end_ - at_)) return fail();
  at_ += count;
  return true;
}

}  // namespace tonewerk
