// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {

// Finds where the frames in a client's bytes end, and reads their heads. It builds no values: the arguments
// are only checked to be MessagePack that does not nest too deep, so that a frame that it finds is one that
// RpcFrameDecoder decodes.
//
//   scan() -> kFrame      frame() describes a request or a notification at the front of the bytes
//          -> kNeedsMore  the frame's end has not arrived; scan again with the same bytes and more
//          -> kBroken     not this protocol, or a response; problem() says why. Nothing is scanned after it
//
// It looks at each byte once, however small the pieces are in which a frame arrives. One thread.
class RpcFrameScanner {
 public:
  enum class Result { kFrame, kNeedsMore, kBroken };

  // Of so many arguments the frame says where they begin.
  static constexpr std::size_t kMaxKnownArguments = 4;

  struct Frame {
    bool isNotification = false;
    std::uint32_t identifier = 0;  // of a request
    std::string_view method;       // points into the scanned bytes; UTF-8
    std::size_t bytes = 0;         // the frame's length
    std::size_t argumentCount = 0;
    // Where the first arguments begin, as offsets in the frame.
    std::array<std::uint32_t, kMaxKnownArguments> arguments{};
  };

  // `bytes` begins with the frame's first byte. After kNeedsMore it must begin with the same bytes as before;
  // they may lie elsewhere.
  [[nodiscard]] Result scan(std::string_view bytes);

  // Valid after kFrame, until the next call of scan().
  const Frame& frame() const { return frame_; }
  // Valid after kBroken.
  const std::string& problem() const { return problem_; }

 private:
  struct Header;

  [[nodiscard]] Result scanHead(std::string_view bytes);
  [[nodiscard]] bool scanUsualHead(std::string_view bytes);
  [[nodiscard]] bool scanUsualArguments(std::string_view bytes);
  void startArguments(std::size_t at, std::size_t count);
  void noteArgument();
  void skipShortValues(std::string_view bytes);
  [[nodiscard]] Result scanArguments(std::string_view bytes);
  [[nodiscard]] Result endFrame(std::string_view bytes);
  [[nodiscard]] Result needMore(std::string_view bytes);
  [[nodiscard]] Result broken(std::string problem);

  Frame frame_;
  std::string problem_;
  std::size_t at_ = 0;        // offset of the next value; 0 while the head is not complete
  std::size_t methodAt_ = 0;  // its offset; the bytes may move while a frame arrives
  std::size_t methodBytes_ = 0;
  std::size_t depth_ = 0;  // arrays and maps that are open
  // The values that are missing at each depth; those of a map are its keys and values.
  std::array<std::uint64_t, kMaxFrameDepth + 1> missing_{};
};

}  // namespace tonewerk
