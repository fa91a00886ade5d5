// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/linux/messagepack/RpcFrame.h"
#include "platform/linux/messagepack/StringInterner.h"

namespace tonewerk {

// Caches of texts that all connections of a thread share.
struct RpcStrings {
  StringInterner keys{1024, 64};
  StringInterner values{1024, 32};
};

// Turns a peer's bytes into frames, in whatever pieces they arrive.
//
//   bytes -> next() -> kFrame      frame() is a request, a response or a notification
//                   -> kNeedsMore  `bytes` is used up; the rest of the frame has not arrived yet
//                   -> kBroken     not this protocol; problem() says why, and next() never recovers
//
// It reads each byte a bounded number of times, whatever the frame's length and however small the pieces. The
// length that a header announces does not determine how much is allocated. One thread.
class RpcFrameReader {
 public:
  enum class Result { kFrame, kNeedsMore, kBroken };

  // `texts` outlives the reader.
  explicit RpcFrameReader(RpcStrings& texts);
  RpcFrameReader(const RpcFrameReader&) = delete;
  RpcFrameReader& operator=(const RpcFrameReader&) = delete;
  ~RpcFrameReader();

  // Reads up to the end of one frame. Removes the bytes that it has used from the front of `bytes`. It may
  // also take bytes of later frames, so call it until it returns kNeedsMore.
  [[nodiscard]] Result next(std::string_view& bytes);

  // Valid after kFrame until the next call of next(). May be moved from.
  RpcFrame& frame();
  // Valid after kBroken.
  const std::string& problem() const;

 private:
  class Parser;
  std::unique_ptr<Parser> parser_;
};

}  // namespace tonewerk
