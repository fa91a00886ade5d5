// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameDecoder.h"

#include <cassert>
#include <concepts>
#include <cstdint>
#include <limits>
#include <msgpack.hpp>
#include <type_traits>
#include <utility>

#include "values/ShapeTable.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMessageArguments = 4;
constexpr std::size_t kMaxKeptIdentifiers = 1024;
static_assert(RpcFrameScanner::kMaxKnownArguments >= kMessageArguments);

// Reads an integer within the range of Number. Returns false for anything else.
template <std::integral Number>
[[nodiscard]] bool readInteger(EncodedValue value, Number& out) {
  return value.isNumber() && encoding::visitNumber(value.begin(), [&out](auto number) {
           if constexpr (std::is_same_v<decltype(number), bool> ||
                         std::is_floating_point_v<decltype(number)>) {
             return false;
           } else {
             if (!std::in_range<Number>(number)) return false;
             out = static_cast<Number>(number);
             return true;
           }
         });
}

}  // namespace

RpcFrame& RpcFrameDecoder::decode(std::string_view bytes) {
  visitor_.init();
  std::size_t end = 0;
  [[maybe_unused]] const bool isFrame = msgpack::parse(bytes.data(), bytes.size(), end, visitor_);
  assert(isFrame && end == bytes.size());
  visitor_.frame().wireBytes = bytes.size();
  return visitor_.frame();
}

IncomingMessage* RpcFrameDecoder::decodeMessage(const Frame& frame, ShapeTable& shapes) {
  if (frame.argumentCount != kMessageArguments) return nullptr;
  const auto argument = [&frame](std::size_t at) {
    return EncodedValue(frame.bytes.data() + frame.arguments[at]);
  };
  if (!readInteger(argument(1), message_.category) || !readInteger(argument(2), message_.type) ||
      !readReporterIDs(argument(3))) {
    return nullptr;
  }
  const std::size_t payloadBytes = frame.arguments[1] - frame.arguments[0];
  const std::uint64_t kind = std::uint64_t{message_.category} << 16U | message_.type;
  PackedMapReader::Read read = reader_.read(frame.bytes.substr(frame.arguments[0], payloadBytes), shapes,
                                            {kind, frame.bytes.size() - frame.arguments[1]});
  if (read.result != PackedMapReader::Result::kPacked) return nullptr;
  message_.payload = std::move(read.map);
  return &message_;
}

std::optional<ReporterID> RpcFrameDecoder::sessionOf(const Frame& frame) {
  if (frame.argumentCount != kMessageArguments) return std::nullopt;
  const char* list = frame.bytes.data() + frame.arguments[3];
  ReporterID session = 0;
  if (encoding::byteAt(list) != (encoding::kFixedArray | 1U) || !readInteger(EncodedValue(list + 1), session))
    return std::nullopt;
  return session;
}

void RpcFrameDecoder::releaseMessage() {
  if (!message_.payload.empty()) message_.payload = {};  // usually it has been moved away
  if (message_.reporterIDs && message_.reporterIDs->capacity() > kMaxKeptIdentifiers) {
    message_.reporterIDs.reset();
  }
}

bool RpcFrameDecoder::readReporterIDs(EncodedValue list) {
  const std::uint8_t first = encoding::byteAt(list.begin());
  if (!encoding::isArray(first)) {
    message_.reporterIDs.reset();
    return first == encoding::kNil;
  }
  if (!message_.reporterIDs) message_.reporterIDs.emplace();  // else its room is used again
  std::vector<ReporterID>& identifiers = *message_.reporterIDs;
  identifiers.clear();
  bool areIdentifiers = true;
  forEachElement(list, [&](EncodedValue element) {
    ReporterID identifier = 0;
    areIdentifiers = areIdentifiers && readInteger(element, identifier);
    if (areIdentifiers) identifiers.push_back(identifier);
  });
  return areIdentifiers;
}

}  // namespace tonewerk
