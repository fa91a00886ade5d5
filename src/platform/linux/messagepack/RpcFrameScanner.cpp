// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameScanner.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <utility>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kRequest = 0;
constexpr std::uint64_t kResponse = 1;
constexpr std::uint64_t kNotification = 2;

// The frame's own array and that of the arguments.
constexpr std::size_t kArgumentsDepth = 2;

enum class Form : std::uint8_t { kInteger, kText, kBinary, kExtension, kArray, kMap, kOther, kInvalid };

// What a value's first byte says.
struct Lead {
  Form form = Form::kInvalid;
  std::uint8_t countBytes =
      0;  // the length of the number after the first byte: a count or the integer itself
  std::uint8_t fixedBytes = 0;  // the length of what follows that number, in addition to a text's bytes
  std::uint8_t fixedCount = 0;  // the count, when the first byte holds it
};

constexpr Lead leadOf(unsigned byte) {
  const auto low = [byte](unsigned mask) { return static_cast<std::uint8_t>(byte & mask); };
  if (byte < 0x80 || byte >= 0xE0) return {Form::kInteger};
  if (byte < 0x90) return {Form::kMap, 0, 0, low(0x0F)};
  if (byte < 0xA0) return {Form::kArray, 0, 0, low(0x0F)};
  if (byte < 0xC0) return {Form::kText, 0, 0, low(0x1F)};
  switch (byte) {
    case 0xC0:
    case 0xC2:
    case 0xC3:
      return {Form::kOther};
    case 0xC4:
      return {Form::kBinary, 1};
    case 0xC5:
      return {Form::kBinary, 2};
    case 0xC6:
      return {Form::kBinary, 4};
    case 0xC7:
      return {Form::kExtension, 1, 1};
    case 0xC8:
      return {Form::kExtension, 2, 1};
    case 0xC9:
      return {Form::kExtension, 4, 1};
    case 0xCA:
      return {Form::kOther, 0, 4};
    case 0xCB:
      return {Form::kOther, 0, 8};
    case 0xCC:
    case 0xD0:
      return {Form::kInteger, 1};
    case 0xCD:
    case 0xD1:
      return {Form::kInteger, 2};
    case 0xCE:
    case 0xD2:
      return {Form::kInteger, 4};
    case 0xCF:
    case 0xD3:
      return {Form::kInteger, 8};
    case 0xD4:
      return {Form::kExtension, 0, 2};
    case 0xD5:
      return {Form::kExtension, 0, 3};
    case 0xD6:
      return {Form::kExtension, 0, 5};
    case 0xD7:
      return {Form::kExtension, 0, 9};
    case 0xD8:
      return {Form::kExtension, 0, 17};
    case 0xD9:
      return {Form::kText, 1};
    case 0xDA:
      return {Form::kText, 2};
    case 0xDB:
      return {Form::kText, 4};
    case 0xDC:
      return {Form::kArray, 2};
    case 0xDD:
      return {Form::kArray, 4};
    case 0xDE:
      return {Form::kMap, 2};
    case 0xDF:
      return {Form::kMap, 4};
    default:
      return {};
  }
}

constexpr auto kLeads = [] {
  std::array<Lead, 256> leads{};
  for (unsigned byte = 0; byte < leads.size(); ++byte) leads[byte] = leadOf(byte);
  return leads;
}();

std::uint8_t byteAt(std::string_view bytes, std::size_t at) { return static_cast<std::uint8_t>(bytes[at]); }

std::uint64_t bigEndian(std::string_view bytes, std::size_t at, std::size_t count) {
  std::uint64_t number = 0;
  for (std::size_t byte = 0; byte < count; ++byte) number = number << 8U | byteAt(bytes, at + byte);
  return number;
}

}  // namespace

// A value's header: its first byte and the count after it.
struct RpcFrameScanner::Header {
  Form form;
  std::uint8_t first;
  std::uint64_t count;    // of a text's bytes, an array's elements or a map's entries; an integer's bits
  std::size_t bytes;      // its own length
  std::size_t bodyBytes;  // the length of what follows; elements and entries not included

  // None when the bytes end before the header.
  static std::optional<Header> read(std::string_view bytes, std::size_t at) {
    if (at >= bytes.size()) return std::nullopt;
    const std::uint8_t first = byteAt(bytes, at);
    const Lead lead = kLeads[first];
    if (bytes.size() - at - 1 < lead.countBytes) return std::nullopt;
    const std::uint64_t count =
        lead.countBytes == 0 ? lead.fixedCount : bigEndian(bytes, at + 1, lead.countBytes);
    const bool hasBody =
        lead.form == Form::kText || lead.form == Form::kBinary || lead.form == Form::kExtension;
    return Header{lead.form, first, count, std::size_t{1} + lead.countBytes,
                  lead.fixedBytes + (hasBody ? static_cast<std::size_t>(count) : 0)};
  }

  // The value of an integer that is not negative.
  std::optional<std::uint64_t> number() const {
    if (form != Form::kInteger || first >= 0xE0) return std::nullopt;
    if (first < 0x80) return first;
    const bool isSigned = first >= 0xD0;
    const unsigned signBit = static_cast<unsigned>(8 * (bytes - 1) - 1);
    if (isSigned && (count >> signBit) != 0) return std::nullopt;
    return count;
  }
};

RpcFrameScanner::Result RpcFrameScanner::scan(std::string_view bytes) {
  if (!problem_.empty()) return Result::kBroken;
  if (at_ == 0) {
    const Result head = scanHead(bytes);
    if (head != Result::kFrame) return head;
  }
  return scanArguments(bytes);
}

// Reads the head anew each time until it is complete, which takes the same time however much has arrived.
RpcFrameScanner::Result RpcFrameScanner::scanHead(std::string_view bytes) {
  const auto frame = Header::read(bytes, 0);
  if (!frame) return needMore(bytes);
  if (frame->form == Form::kInvalid) return broken("bytes that are not MessagePack");
  if (frame->form == Form::kMap) return broken("a map in a frame's place for something else");
  if (frame->form != Form::kArray) return broken("something that is no array");
  if (frame->count != 3 && frame->count != 4) return broken("an array that is no frame");
  std::size_t at = frame->bytes;

  const auto kind = Header::read(bytes, at);
  if (!kind) return needMore(bytes);
  const std::optional<std::uint64_t> kindNumber = kind->number();
  if (!kindNumber || *kindNumber > kNotification) return broken("a frame of no known kind");
  if (frame->count != (*kindNumber == kNotification ? 3U : 4U)) {
    return broken("a frame of the wrong length for its kind");
  }
  if (*kindNumber == kResponse) return broken("a response");
  at += kind->bytes;

  frame_.isNotification = *kindNumber == kNotification;
  if (*kindNumber == kRequest) {
    const auto identifier = Header::read(bytes, at);
    if (!identifier) return needMore(bytes);
    const std::optional<std::uint64_t> number = identifier->number();
    if (!number || *number > std::numeric_limits<std::uint32_t>::max()) {
      return broken("a frame whose identifier is not a 32-bit number");
    }
    frame_.identifier = static_cast<std::uint32_t>(*number);
    at += identifier->bytes;
  }

  const auto method = Header::read(bytes, at);
  if (!method) return needMore(bytes);
  if (method->form != Form::kText) return broken("a frame whose method or arguments are something else");
  at += method->bytes;
  if (bytes.size() - at < method->bodyBytes) return needMore(bytes);
  const std::size_t methodAt = at;
  at += method->bodyBytes;
  if (!isUtf8(bytes.substr(methodAt, method->bodyBytes))) return broken("a frame whose method is not UTF-8");
  const auto arguments = Header::read(bytes, at);
  if (!arguments) return needMore(bytes);
  if (arguments->form != Form::kArray) {
    return broken("a frame whose method or arguments are something else");
  }
  methodAt_ = methodAt;
  methodBytes_ = method->bodyBytes;
  at_ = at + arguments->bytes;
  depth_ = kArgumentsDepth;
  missing_[depth_] = arguments->count;
  return Result::kFrame;
}

RpcFrameScanner::Result RpcFrameScanner::scanArguments(std::string_view bytes) {
  for (;;) {
    while (missing_[depth_] == 0) {
      if (--depth_ < kArgumentsDepth) return endFrame(bytes);
    }
    const auto value = Header::read(bytes, at_);
    if (!value) return needMore(bytes);
    if (value->form == Form::kInvalid) return broken("bytes that are not MessagePack");
    if (value->bodyBytes > kMaxFrameBytes) return broken("a frame that is too long");
    if (bytes.size() - at_ - value->bytes < value->bodyBytes) return needMore(bytes);
    at_ += value->bytes + value->bodyBytes;
    --missing_[depth_];
    if (value->form != Form::kArray && value->form != Form::kMap) continue;
    if (depth_ == kMaxFrameDepth) return broken("a frame nested too deep");
    missing_[++depth_] = value->form == Form::kMap ? 2 * value->count : value->count;
  }
}

RpcFrameScanner::Result RpcFrameScanner::endFrame(std::string_view bytes) {
  if (at_ > kMaxFrameBytes) return broken("a frame that is too long");
  frame_.method = bytes.substr(methodAt_, methodBytes_);
  frame_.bytes = std::exchange(at_, 0);
  return Result::kFrame;
}

RpcFrameScanner::Result RpcFrameScanner::needMore(std::string_view bytes) {
  return bytes.size() > kMaxFrameBytes ? broken("a frame that is too long") : Result::kNeedsMore;
}

RpcFrameScanner::Result RpcFrameScanner::broken(std::string problem) {
  problem_ = std::move(problem);
  return Result::kBroken;
}

}  // namespace tonewerk
