// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameScanner.h"

#include <algorithm>
#include <cstddef>
#include <limits>
#include <optional>
#include <type_traits>
#include <utility>

#include "values/Bytes.h"
#include "values/EncodedValue.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kRequest = 0;
constexpr std::uint64_t kResponse = 1;
constexpr std::uint64_t kNotification = 2;

// The frame's own array and that of the arguments.
constexpr std::size_t kArgumentsDepth = 2;

// The start of a frame and its kind, a number of 32 bits, a text of 31 bytes, the start of the arguments.
constexpr std::size_t kUsualHeadBytes = 2 + 5 + 32 + 1;

}  // namespace

// What a value's first bytes say.
struct RpcFrameScanner::Header {
  std::uint8_t first;
  std::size_t bytes;      // its own length; that of a number is the number's
  std::size_t count = 0;  // the elements of an array, the entries of a map
  std::size_t bodyBytes;  // the length of what follows; elements and entries not included

  // None when the bytes end before the header.
  static std::optional<Header> read(std::string_view bytes, std::size_t at) {
    if (at >= bytes.size()) return std::nullopt;
    const std::uint8_t first = encoding::byteAt(bytes.data() + at);
    const std::size_t left = bytes.size() - at;
    const std::size_t scalar = encoding::kNumberLengths[first];
    if (scalar > left) return std::nullopt;
    if (scalar > 0) return Header{first, scalar, 0, 0};
    if (first == encoding::kNil || first == encoding::kReserved) return Header{first, 1, 0, 0};
    if (encoding::headerLength(first) > left) return std::nullopt;
    const encoding::Extent extent = encoding::extentAt(bytes.data() + at);
    const bool isContainer = encoding::isArray(first) || encoding::isMap(first);
    return Header{first, extent.header, isContainer ? extent.count : 0, isContainer ? 0 : extent.count};
  }

  bool isInvalid() const { return first == encoding::kReserved; }
};

namespace {

// Goes over values of which nearly all are numbers and short texts. Far from the end of the bytes these need
// not be compared with it.
class ShortValues {
 public:
  ShortValues(std::string_view bytes, std::size_t at)
      : begin_(bytes.data()),
        at_(begin_ + at),
        limit_(begin_ + bytes.size() - std::min(bytes.size(), kRoomBytes)) {}

  // The offset of the next value.
  std::size_t at() const { return static_cast<std::size_t>(at_ - begin_); }

  // Goes behind the next value, an array or a map included that holds none. False at other values than texts
  // of up to 255 bytes and those whose first byte says how long they are, and near the end of the bytes.
  bool skipArgument() {
    if (at_ >= limit_) return false;
    const std::uint8_t first = encoding::byteAt(at_);
    if ((first & 0xE0U) != encoding::kFixedMap && first < encoding::kArray16) return skip();
    const encoding::Extent extent = encoding::extentAt(at_);
    const bool isMap = encoding::isMap(first);
    if (!isMap && !encoding::isArray(first)) return skip();
    at_ += extent.header;
    return isMap ? skipEntries(extent.count) : skipElements(extent.count);
  }

 private:
  // Two values whose first byte says how long they are, and the header of any.
  static constexpr std::size_t kRoomBytes =
      std::size_t{2} * *std::max_element(encoding::kFixedLengths.begin(), encoding::kFixedLengths.end());

  bool skipEntries(std::size_t count) {
    for (; count > 0; --count) {
      if (at_ >= limit_) return false;
      const std::size_t key = encoding::kFixedLengths[encoding::byteAt(at_)];
      const std::size_t value = encoding::kFixedLengths[encoding::byteAt(at_ + key)];
      if (key != 0 && value != 0) {
        at_ += key + value;
      } else if (!skip() || !skip()) {
        return false;
      }
    }
    return true;
  }

  bool skipElements(std::size_t count) {
    for (; count > 0; --count) {
      if (!skip()) return false;
    }
    return true;
  }

  bool skip() {
    if (at_ >= limit_) return false;
    const std::uint8_t first = encoding::byteAt(at_);
    std::size_t length = encoding::kFixedLengths[first];
    if (first == encoding::kText8) length = 2 + std::size_t{encoding::byteAt(at_ + 1)};
    if (length == 0 || length > static_cast<std::size_t>(limit_ - at_)) return false;
    at_ += length;
    return true;
  }

  const char* const begin_;
  const char* at_;
  const char* const limit_;  // from here on a value is near the end
};

// The value of an integer that is not negative. `bytes` begin with a whole number or boolean, or with
// something else.
std::optional<std::uint64_t> naturalAt(const char* bytes) {
  if (encoding::kNumberLengths[encoding::byteAt(bytes)] == 0) return std::nullopt;
  return encoding::visitNumber(bytes, [](auto number) -> std::optional<std::uint64_t> {
    using Number = decltype(number);
    if constexpr (std::is_same_v<Number, bool> || std::is_same_v<Number, double>) {
      return std::nullopt;
    } else {
      return number < Number{0} ? std::nullopt : std::optional(static_cast<std::uint64_t>(number));
    }
  });
}

}  // namespace

RpcFrameScanner::Result RpcFrameScanner::scan(std::string_view bytes) {
  if (!problem_.empty()) return Result::kBroken;
  if (at_ == 0) {
    const Result head = scanUsualHead(bytes) ? Result::kFrame : scanHead(bytes);
    if (head != Result::kFrame) return head;
    if (scanUsualArguments(bytes)) return endFrame(bytes);
  }
  return scanArguments(bytes);
}

// Finds the end of usual arguments: few, of which maps and arrays hold only numbers and short texts. All
// others and those near the end of the bytes are left to scanArguments(), which begins anew; so nothing is
// read more than twice.
bool RpcFrameScanner::scanUsualArguments(std::string_view bytes) {
  const std::size_t count = frame_.argumentCount;
  if (count > kMaxKnownArguments) return false;
  ShortValues values(bytes, at_);
  for (std::size_t index = 0; index < count; ++index) {
    frame_.arguments[index] = static_cast<std::uint32_t>(values.at());
    if (!values.skipArgument()) return false;
  }
  at_ = values.at();
  return true;
}

// Reads the head of a request or a notification as clients usually write it, and leaves all others to
// scanHead(). With so many bytes it need not ask whether each part has arrived.
bool RpcFrameScanner::scanUsualHead(std::string_view bytes) {
  if (bytes.size() < kUsualHeadBytes) return false;
  const char* at = bytes.data();
  const bool isRequest = encoding::byteAt(at) == encoding::kFixedArray + 4;
  const auto kind = static_cast<std::uint8_t>(isRequest ? kRequest : kNotification);
  if ((!isRequest && encoding::byteAt(at) != encoding::kFixedArray + 3) || encoding::byteAt(at + 1) != kind) {
    return false;
  }
  at += 2;
  std::uint32_t identifier = 0;
  if (isRequest) {
    const std::uint8_t first = encoding::byteAt(at);
    if (first == encoding::kUnsigned32) {
      identifier = bigEndianAt<std::uint32_t>(at + 1);
    } else if (first == encoding::kUnsigned16) {
      identifier = bigEndianAt<std::uint16_t>(at + 1);
    } else if (first < encoding::kFixedMap) {
      identifier = first;
    } else {
      return false;
    }
    at += encoding::kFixedLengths[first];
  }
  const std::string_view method(at + 1, encoding::byteAt(at) & 0x1FU);
  const char* const arguments = method.data() + method.size();
  const bool isUsual = (encoding::byteAt(at) & 0xE0U) == encoding::kFixedText && isAscii(method) &&
                       (encoding::byteAt(arguments) & 0xF0U) == encoding::kFixedArray;
  if (!isUsual) return false;
  frame_.isNotification = !isRequest;
  if (isRequest) frame_.identifier = identifier;
  methodAt_ = static_cast<std::size_t>(method.data() - bytes.data());
  methodBytes_ = method.size();
  startArguments(methodAt_ + methodBytes_ + 1, encoding::byteAt(arguments) & 0x0FU);
  return true;
}

// Reads the head anew each time until it is complete, which takes the same time however much has arrived.
RpcFrameScanner::Result RpcFrameScanner::scanHead(std::string_view bytes) {
  const auto frame = Header::read(bytes, 0);
  if (!frame) return needMore(bytes);
  if (frame->isInvalid()) return broken("bytes that are not MessagePack");
  if (encoding::isMap(frame->first)) return broken("a map in a frame's place for something else");
  if (!encoding::isArray(frame->first)) return broken("something that is no array");
  if (frame->count != 3 && frame->count != 4) return broken("an array that is no frame");
  std::size_t at = frame->bytes;

  const auto kind = Header::read(bytes, at);
  if (!kind) return needMore(bytes);
  const std::optional<std::uint64_t> kindNumber = naturalAt(bytes.data() + at);
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
    const std::optional<std::uint64_t> number = naturalAt(bytes.data() + at);
    if (!number || *number > std::numeric_limits<std::uint32_t>::max()) {
      return broken("a frame whose identifier is not a 32-bit number");
    }
    frame_.identifier = static_cast<std::uint32_t>(*number);
    at += identifier->bytes;
  }

  const auto method = Header::read(bytes, at);
  if (!method) return needMore(bytes);
  if (!encoding::isText(method->first)) return broken("a frame whose method or arguments are something else");
  at += method->bytes;
  if (bytes.size() - at < method->bodyBytes) return needMore(bytes);
  const std::size_t methodAt = at;
  at += method->bodyBytes;
  if (!isUtf8(bytes.substr(methodAt, method->bodyBytes))) return broken("a frame whose method is not UTF-8");
  const auto arguments = Header::read(bytes, at);
  if (!arguments) return needMore(bytes);
  if (!encoding::isArray(arguments->first)) {
    return broken("a frame whose method or arguments are something else");
  }
  methodAt_ = methodAt;
  methodBytes_ = method->bodyBytes;
  startArguments(at + arguments->bytes, arguments->count);
  return Result::kFrame;
}

void RpcFrameScanner::startArguments(std::size_t at, std::size_t count) {
  at_ = at;
  depth_ = kArgumentsDepth;
  missing_[depth_] = count;
  frame_.argumentCount = count;
}

RpcFrameScanner::Result RpcFrameScanner::scanArguments(std::string_view bytes) {
  for (;;) {
    if (depth_ > kArgumentsDepth) skipShortValues(bytes);
    while (missing_[depth_] == 0) {
      if (--depth_ < kArgumentsDepth) return endFrame(bytes);
    }
    if (depth_ == kArgumentsDepth) noteArgument();
    const auto value = Header::read(bytes, at_);
    if (!value) return needMore(bytes);
    if (value->isInvalid()) return broken("bytes that are not MessagePack");
    if (value->bodyBytes > kMaxFrameBytes) return broken("a frame that is too long");
    if (bytes.size() - at_ - value->bytes < value->bodyBytes) return needMore(bytes);
    at_ += value->bytes + value->bodyBytes;
    --missing_[depth_];
    const bool isMap = encoding::isMap(value->first);
    if (!isMap && !encoding::isArray(value->first)) continue;
    if (depth_ == kMaxFrameDepth) return broken("a frame nested too deep");
    missing_[++depth_] = isMap ? 2 * value->count : value->count;
  }
}

// Nearly all values inside of arguments are numbers and short texts, whose first byte says how long they are.
void RpcFrameScanner::skipShortValues(std::string_view bytes) {
  const char* at = bytes.data() + at_;
  const char* const end = bytes.data() + bytes.size();
  std::uint64_t missing = missing_[depth_];
  for (; missing > 0 && at < end; --missing) {
    const std::size_t length = encoding::kFixedLengths[encoding::byteAt(at)];
    if (length == 0 || length > static_cast<std::size_t>(end - at)) break;
    at += length;
  }
  missing_[depth_] = missing;
  at_ = static_cast<std::size_t>(at - bytes.data());
}

void RpcFrameScanner::noteArgument() {
  const std::uint64_t index = frame_.argumentCount - missing_[kArgumentsDepth];
  if (index < kMaxKnownArguments) frame_.arguments[index] = static_cast<std::uint32_t>(at_);
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
