// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameVisitor.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <utility>

#include "platform/linux/messagepack/RpcTimestamp.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// Reserved at most for the count that a header announces. The rest is allocated as elements arrive.
constexpr std::uint32_t kMaxReserved = 64;
// A map among the arguments is usually a message, to which its session adds a few entries.
constexpr std::size_t kMessageDepth = 3;
constexpr std::uint32_t kRoomForAdditions = 3;
// More than any method has. Further ones are refused, so that a frame of nil arguments does not become a huge
// list.
constexpr std::size_t kMaxArguments = 16;

// Indexes in a response's array.
constexpr std::size_t kErrorPlace = 2;
constexpr std::size_t kResultPlace = 3;

// Indexes in the frame's array: first the kind, then the identifier (not in notifications), then the method
// or the error.
constexpr std::size_t identifierPlace(RpcFrame::Kind kind) {
  return kind == RpcFrame::Kind::kNotification ? std::numeric_limits<std::size_t>::max() : 1;
}
constexpr std::size_t methodPlace(RpcFrame::Kind kind) {
  return kind == RpcFrame::Kind::kNotification ? 1 : 2;
}

}  // namespace

bool RpcFrameVisitor::broken(std::string problem) {
  if (problem_.empty()) problem_ = std::move(problem);
  return false;
}

void RpcFrameVisitor::init() {
  frame_.arguments = {};
  frame_.error.reset();
  frame_.result.reset();
  frame_.refused.reset();
  frame_.wireBytes = 0;
  depth_ = 0;
  framePlace_ = 0;
  isReadingArguments_ = false;
}

void RpcFrameVisitor::initAt(ValuePlace place) {
  init();
  if (place == ValuePlace::kResult) {
    frame_.kind = RpcFrame::Kind::kResponse;
    framePlace_ = kResultPlace;
    depth_ = 1;
  } else {
    frame_.kind = RpcFrame::Kind::kRequest;
    framePlace_ = methodPlace(frame_.kind) + 1;
    startArguments(1);
  }
}

bool RpcFrameVisitor::visit_nil() {
  if (isInArguments()) {
    if (frame_.arguments.size() >= kMaxArguments) return refuse("is one too many");
    frame_.arguments.emplace_back();
    return true;
  }
  const bool isResponseElement =
      isInFrame() && framePlace_ >= kErrorPlace && frame_.kind == RpcFrame::Kind::kResponse;
  if (isResponseElement) {
    ++framePlace_;
    return true;
  }
  if (isInFrame() || depth_ == 0) return broken("nil in a frame's place for something else");
  return refuse("holds nil");
}

bool RpcFrameVisitor::visit_positive_integer(std::uint64_t value) {
  constexpr auto kMaxSigned = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  if (value > kMaxSigned) return put(Value(value));
  return put(Value(static_cast<std::int64_t>(value)));
}

bool RpcFrameVisitor::visit_negative_integer(std::int64_t value) { return put(Value(value)); }

bool RpcFrameVisitor::visit_str(const char* data, std::uint32_t size) {
  const std::string_view text(data, size);
  if (isInFrame() && frame_.kind != RpcFrame::Kind::kResponse && framePlace_ > 0 &&
      framePlace_ == methodPlace(frame_.kind)) {
    return setMethod(text);
  }
  if (isKeyAwaited()) return putKey(text);
  std::optional<SharedString> shared = sharedText(texts_.values, text);
  if (!shared) {
    if (depth_ <= 1) return broken("text that is not UTF-8 in a frame's place for something else");
    return refuse(isUtf8(text) ? "holds text with a noncharacter" : "holds text that is not UTF-8");
  }
  return put(Value(std::move(*shared)));
}

bool RpcFrameVisitor::visit_bin(const char*, std::uint32_t) {
  if (depth_ <= 1) return broken("binary data in a frame's place for something else");
  return refuse("holds binary data");
}

bool RpcFrameVisitor::visit_ext(const char* data, std::uint32_t size) {
  if (depth_ <= 1) return broken("an extension in a frame's place for something else");
  if (static_cast<signed char>(data[0]) != kTimestampExtension)
    return refuse("holds an extension other than a date");
  const std::optional<Date> date = dateOfTimestamp(std::string_view(data + 1, size - 1));
  if (!date) return refuse("holds a malformed date");
  return put(Value(*date));
}

bool RpcFrameVisitor::start_array(std::uint32_t count) {
  if (depth_ == 0) return startFrame(count);
  if (isInFrame() && framePlace_ > 0 && frame_.kind != RpcFrame::Kind::kResponse &&
      framePlace_ == methodPlace(frame_.kind) + 1) {
    return startArguments(count);
  }
  return open(false, count);
}

bool RpcFrameVisitor::start_map(std::uint32_t count) { return open(true, count); }

bool RpcFrameVisitor::start_map_key() {
  containers_[depth_ - 1].awaitsKey = true;
  return true;
}

bool RpcFrameVisitor::start_map_value() {
  containers_[depth_ - 1].awaitsKey = false;
  return true;
}

bool RpcFrameVisitor::end_array() {
  if (depth_ == 1) {
    depth_ = 0;
    return true;  // the frame is complete, and the parser stops here
  }
  if (isInArguments()) {
    isReadingArguments_ = false;
    depth_ = 1;
    ++framePlace_;
    return true;
  }
  Container& container = containers_[--depth_];
  return put(Value(ValueArray(std::exchange(container.values, {}))));
}

bool RpcFrameVisitor::end_map() {
  Container& container = containers_[--depth_];
  return put(Value(std::exchange(container.map, {})));
}

bool RpcFrameVisitor::open(bool isMap, std::uint32_t count) {
  const bool isResponseElement =
      isInFrame() && framePlace_ >= kErrorPlace && frame_.kind == RpcFrame::Kind::kResponse;
  if (depth_ == 0 || (isInFrame() && !isResponseElement)) {
    return broken(isMap ? "a map in a frame's place for something else"
                        : "an array in a frame's place for something else");
  }
  if (depth_ == kMaxFrameDepth) return broken("a frame nested too deep");
  Container& container = containers_[depth_++];
  container.isMap = isMap;
  container.awaitsKey = false;
  const std::uint32_t room = std::min(count, kMaxReserved);
  container.map = {};
  container.values = {};
  container.keyBits = 0;
  if (isMap) {
    container.map.reserve(depth_ == kMessageDepth ? room + kRoomForAdditions : room);
  } else {
    container.values.reserve(room);
  }
  return true;
}

bool RpcFrameVisitor::startFrame(std::uint32_t count) {
  if (count != 3 && count != 4) return broken("an array that is no frame");
  frameSize_ = count;
  depth_ = 1;
  return true;
}

bool RpcFrameVisitor::startArguments(std::uint32_t count) {
  frame_.arguments.reserve(std::min<std::size_t>(count, kMaxArguments));
  isReadingArguments_ = true;
  depth_ = 2;
  return true;
}

bool RpcFrameVisitor::put(Value value) {
  if (depth_ <= 1) return putInFrame(std::move(value));
  if (isInArguments()) {
    if (frame_.arguments.size() >= kMaxArguments) return refuse("is one too many");
    frame_.arguments.emplace_back(std::move(value));
    return true;
  }
  Container& container = containers_[depth_ - 1];
  if (!container.isMap) {
    container.values.push_back(std::move(value));
  } else if (container.awaitsKey) {
    return refuse("has a key that is not a text");
  } else {
    putInMap(container, std::move(value));
  }
  return true;
}

// Usually does not compare with the earlier keys: other threads change their reference counts, so reading
// them is slow.
void RpcFrameVisitor::putInMap(Container& container, Value value) {
  const std::uint64_t bit = std::uint64_t{1} << (container.key.hash() & 63U);
  if ((container.keyBits & bit) == 0) {
    container.map.add(std::move(container.key), std::move(value));
  } else {
    container.map.set(std::move(container.key), std::move(value));
  }
  container.keyBits |= bit;
}

bool RpcFrameVisitor::putInFrame(Value value) {
  if (depth_ == 0) return broken("something that is no array");
  if (framePlace_ == 0) return setKind(value);
  if (framePlace_ == identifierPlace(frame_.kind)) return setIdentifier(value);
  if (frame_.kind != RpcFrame::Kind::kResponse)
    return broken("a frame whose method or arguments are something else");
  (framePlace_ == kResultPlace ? frame_.result : frame_.error) = std::move(value);
  ++framePlace_;
  return true;
}

bool RpcFrameVisitor::setKind(const Value& value) {
  const std::int64_t* number = value.asInteger();
  if (number == nullptr || *number < 0 || *number > 2) return broken("a frame of no known kind");
  constexpr RpcFrame::Kind kKinds[] = {RpcFrame::Kind::kRequest, RpcFrame::Kind::kResponse,
                                       RpcFrame::Kind::kNotification};
  frame_.kind = kKinds[*number];
  const std::size_t wanted = frame_.kind == RpcFrame::Kind::kNotification ? 3 : 4;
  if (frameSize_ != wanted) return broken("a frame of the wrong length for its kind");
  ++framePlace_;
  return true;
}

bool RpcFrameVisitor::setIdentifier(const Value& value) {
  const std::int64_t* number = value.asInteger();
  if (number == nullptr || *number < 0 || *number > std::numeric_limits<std::uint32_t>::max()) {
    return broken("a frame whose identifier is not a 32-bit number");
  }
  frame_.identifier = static_cast<std::uint32_t>(*number);
  ++framePlace_;
  return true;
}

bool RpcFrameVisitor::setMethod(std::string_view text) {
  if (!isUtf8(text)) return broken("a frame whose method is not UTF-8");
  frame_.method = text;
  ++framePlace_;
  return true;
}

// A daemon's answer may hold text that is not from a client, such as the name of a process. A noncharacter in
// it must not end the connection.
std::optional<SharedString> RpcFrameVisitor::sharedText(StringInterner& cache, std::string_view text) const {
  std::optional<SharedString> shared = cache.find(text);
  if (!shared && frame_.kind == RpcFrame::Kind::kResponse && isUtf8(text)) shared.emplace(text);
  return shared;
}

bool RpcFrameVisitor::putKey(std::string_view text) {
  std::optional<SharedString> shared = sharedText(texts_.keys, text);
  if (!shared) return refuse(isUtf8(text) ? "has a key with a noncharacter" : "has a key that is not UTF-8");
  containers_[depth_ - 1].key = std::move(*shared);
  return true;
}

bool RpcFrameVisitor::refuse(const char* what) {
  if (!frame_.refused) frame_.refused = RefusedValue{frame_.arguments.size(), what};
  // Adds a placeholder, so that the arguments after it keep their index.
  if (isInArguments() && frame_.arguments.size() < kMaxArguments) frame_.arguments.emplace_back(Value());
  return true;
}

}  // namespace tonewerk
