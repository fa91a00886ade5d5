// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcFrameVisitor.h"

namespace tonewerk {

// Builds the values of frames that an RpcFrameScanner has found. One thread at a time.
class RpcFrameDecoder {
 public:
  // `bytes` are one whole frame. The result is valid until the next call, and may be moved from.
  RpcFrame& decode(std::string_view bytes);

 private:
  RpcStrings texts_;
  RpcFrameVisitor visitor_{texts_};
};

}  // namespace tonewerk
