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

namespace tonewerk {

class ShapeTable;

// Builds the values of frames that an RpcFrameScanner has found. One thread at a time.
//
// With a table of shapes, maps among the arguments become packed where the table has room for their keys. All
// other frames go through the visitor, which builds trees; the values and the refusals are the same.
class RpcFrameDecoder {
 public:
  using ArgumentOffsets = std::array<std::uint32_t, RpcFrameScanner::kMaxKnownArguments>;

  // What an RpcFrameScanner has found, without the method.
  struct Frame {
    std::string_view bytes;  // one whole frame
    std::size_t argumentCount = 0;
    ArgumentOffsets arguments{};
  };

  // `shapes` may be null. The result is valid until the next call, and may be moved from. Its method is empty
  // when the frame did not go through the visitor.
  RpcFrame& decode(const Frame& frame, ShapeTable* shapes);
  RpcFrame& decode(std::string_view bytes) { return decode({bytes}, nullptr); }

 private:
  // Returns false when the frame is one for the visitor.
  [[nodiscard]] bool decodePacked(const Frame& frame, ShapeTable& shapes);
  [[nodiscard]] bool addArgument(std::string_view bytes, ShapeTable& shapes);

  RpcStrings texts_;
  RpcFrameVisitor visitor_{texts_};
  PackedMapReader reader_;
  RpcFrame packed_;
};

}  // namespace tonewerk
