// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameDecoder.h"

#include <cassert>
#include <cstddef>
#include <msgpack.hpp>

namespace tonewerk {

RpcFrame& RpcFrameDecoder::decode(std::string_view bytes) {
  visitor_.init();
  std::size_t end = 0;
  [[maybe_unused]] const bool isFrame = msgpack::parse(bytes.data(), bytes.size(), end, visitor_);
  assert(isFrame && end == bytes.size());
  visitor_.frame().wireBytes = bytes.size();
  return visitor_.frame();
}

}  // namespace tonewerk
