// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "platform/linux/messagepack/PackedMapReader.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "platform/linux/messagepack/RpcFrameVisitor.h"
#include "protocol/IncomingMessage.h"
#include "values/EncodedValue.h"

namespace tonewerk {

class ShapeTable;

// Builds the values of frames that an RpcFrameScanner has found. One thread at a time.
//
// Messages get a payload that is packed where a table of shapes has room for its keys. All other frames go
// through the visitor, which builds trees.
class RpcFrameDecoder {
 public:
  using ArgumentOffsets = std::array<std::uint32_t, RpcFrameScanner::kMaxKnownArguments>;

  // What an RpcFrameScanner has found, without the method.
  struct Frame {
    std::string_view bytes;  // one whole frame
    std::size_t argumentCount = 0;
    ArgumentOffsets arguments{};
  };

  // The results are valid until the next call, and may be moved from.
  RpcFrame& decode(std::string_view bytes);
  // Decodes a request that carries a message. Null when its arguments do not fit, when a value is refused and
  // when the payload cannot be packed: decode() then says what is wrong, or makes a tree of the same values.
  IncomingMessage* decodeMessage(const Frame& frame, ShapeTable& shapes);
  // The session of a request that carries a message for one session; none for any other.
  static std::optional<ReporterID> sessionOf(const Frame& frame);
  // Frees what is left of the last message, but for some room for identifiers.
  void releaseMessage();

 private:
  // Reads the sessions' identifiers, or nil.
  [[nodiscard]] bool readReporterIDs(EncodedValue list);

  RpcStrings texts_;
  RpcFrameVisitor visitor_{texts_};
  PackedMapReader reader_;
  IncomingMessage message_;
};

}  // namespace tonewerk
