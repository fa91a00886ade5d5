// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcValueReader.h"

#include <cstddef>
#include <msgpack.hpp>
#include <utility>

#include "platform/linux/messagepack/RpcFrameVisitor.h"
#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {
namespace {

bool parseAll(std::string_view bytes, RpcFrameVisitor& visitor) {
  try {
    std::size_t end = 0;
    return msgpack::parse(bytes.data(), bytes.size(), end, visitor) && end == bytes.size();
  } catch (const msgpack::unpack_error&) {
    return false;  // an extension of an impossible length
  }
}

}  // namespace

std::optional<Value> readValue(std::string_view bytes, ValuePlace place) {
  if (bytes.size() > kMaxFrameBytes) return std::nullopt;
  RpcStrings texts{StringInterner(1, 0), StringInterner(1, 0)};
  RpcFrameVisitor visitor(texts);
  visitor.initAt(place);
  if (!parseAll(bytes, visitor) || visitor.frame().refused) return std::nullopt;
  RpcFrame& frame = visitor.frame();
  return std::move(place == ValuePlace::kResult ? frame.result : frame.arguments.front());
}

}  // namespace tonewerk
