// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameDecoder.h"

#include <cassert>
#include <msgpack.hpp>
#include <utility>
#include <vector>

#include "values/EncodedValue.h"
#include "values/ShapeTable.h"

namespace tonewerk {

RpcFrame& RpcFrameDecoder::decode(const Frame& frame, ShapeTable* shapes) {
  if (shapes != nullptr && decodePacked(frame, *shapes)) return packed_;
  visitor_.init();
  std::size_t end = 0;
  [[maybe_unused]] const bool isFrame = msgpack::parse(frame.bytes.data(), frame.bytes.size(), end, visitor_);
  assert(isFrame && end == frame.bytes.size());
  visitor_.frame().wireBytes = frame.bytes.size();
  return visitor_.frame();
}

bool RpcFrameDecoder::decodePacked(const Frame& frame, ShapeTable& shapes) {
  const std::size_t count = frame.argumentCount;
  if (count == 0 || count > frame.arguments.size()) return false;
  if (!encoding::isMap(encoding::byteAt(frame.bytes.data() + frame.arguments[0]))) return false;
  packed_.arguments.clear();
  packed_.arguments.reserve(count);
  packed_.refused.reset();
  packed_.wireBytes = frame.bytes.size();
  for (std::size_t index = 0; index < count; ++index) {
    const std::size_t begin = frame.arguments[index];
    const std::size_t end = index + 1 < count ? frame.arguments[index + 1] : frame.bytes.size();
    if (!addArgument(frame.bytes.substr(begin, end - begin), shapes)) {
      packed_.arguments.clear();  // which would hold memory until the next packed frame
      return false;
    }
  }
  return true;
}

bool RpcFrameDecoder::addArgument(std::string_view bytes, ShapeTable& shapes) {
  const std::uint8_t first = encoding::byteAt(bytes.data());
  const EncodedValue value(bytes.data());
  if (encoding::isMap(first)) {
    PackedMapReader::Read read = reader_.read(bytes, shapes);
    if (read.result == PackedMapReader::Result::kTree) return false;
    if (read.result == PackedMapReader::Result::kRefused && !packed_.refused) {
      packed_.refused = RefusedValue{packed_.arguments.size(), read.refused};
    }
    packed_.arguments.emplace_back(std::move(read.map));
  } else if (first == encoding::kNil) {
    packed_.arguments.emplace_back();
  } else if (value.isNumber()) {
    packed_.arguments.emplace_back(value.scalar());
  } else if (encoding::isArray(first)) {
    std::vector<Value> numbers;
    bool areNumbers = true;
    forEachElement(value, [&](EncodedValue element) {
      areNumbers = areNumbers && element.isNumber();
      if (areNumbers) numbers.push_back(element.scalar());
    });
    if (!areNumbers) return false;
    packed_.arguments.emplace_back(ValueArray(std::move(numbers)));
  } else {
    return false;
  }
  return true;
}

}  // namespace tonewerk
