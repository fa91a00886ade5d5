// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/linux/messagepack/RpcFrame.h"
#include "platform/linux/messagepack/StringInterner.h"

namespace tonewerk {

// The texts that all connections of a thread share.
struct RpcStrings {
  StringInterner keys{1024, 64};
  StringInterner values{1024, 32};
};

// Turns a peer's bytes into frames, however they are cut up on their way.
//
//   bytes -> next() -> kFrame      frame() is a request, a response or a notification
//                   -> kNeedsMore  `bytes` is used up; the rest of the frame has yet to come
//                   -> kBroken     not this protocol; problem() says why, and there is no way on
//
// Every byte is looked at a bounded number of times, whatever the frame's length and however small the
// pieces. What a header claims of lengths to come allocates nothing. One thread.
class RpcFrameReader {
 public:
  enum class Result { kFrame, kNeedsMore, kBroken };

  // `texts` outlives the reader.
  explicit RpcFrameReader(RpcStrings& texts);
  RpcFrameReader(const RpcFrameReader&) = delete;
  RpcFrameReader& operator=(const RpcFrameReader&) = delete;
  ~RpcFrameReader();

  // Reads up to the end of one frame. Takes what it has used off the front of `bytes`, and it may take bytes
  // of later frames, too: call it until it needs more.
  [[nodiscard]] Result next(std::string_view& bytes);

  // After kFrame, until next(). May be moved from.
  RpcFrame& frame();
  // After kBroken.
  const std::string& problem() const;

 private:
  class Parser;
  std::unique_ptr<Parser> parser_;
};

}  // namespace tonewerk
