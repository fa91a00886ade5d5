// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameReader.h"

#include <algorithm>
#include <cstring>
#include <msgpack.hpp>
#include <utility>

#include "platform/linux/messagepack/RpcFrameVisitor.h"
#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {
namespace {

// The parser copies unfinished input into its own buffer. It is fed in slices, so that this buffer stays
// small however many clients are connected. Only a long text makes it grow, and it is replaced by a small one
// at the next frame.
constexpr std::size_t kSliceBytes = 4096;
constexpr std::size_t kParserBytes = 2 * kSliceBytes + 64;

// The parser can leave its buffer to objects that point into it. The visitor copies everything, so there are
// none.
struct NoReferences {
  void operator()(char*) const {}
};
NoReferences noReferences;

class FrameParser : public msgpack::parser<FrameParser, NoReferences> {
 public:
  explicit FrameParser(RpcFrameVisitor& visitor) : parser(noReferences, kParserBytes), visitor_(&visitor) {}

  RpcFrameVisitor& visitor() { return *visitor_; }
  static bool referenced() { return false; }
  static void set_referenced(bool) {}

 private:
  RpcFrameVisitor* visitor_;
};

}  // namespace

class RpcFrameReader::Parser {
 public:
  explicit Parser(RpcStrings& texts) : visitor_(texts), parser_(std::make_unique<FrameParser>(visitor_)) {
    visitor_.init();
  }

  RpcFrameVisitor& visitor() { return visitor_; }

  Result next(std::string_view& bytes) {
    if (!visitor_.problem().empty()) return Result::kBroken;
    if (isFrameDone_) startFrame();
    for (;;) {
      if (parser_->nonparsed_size() > 0 && parse()) return endFrame();
      if (!visitor_.problem().empty()) return Result::kBroken;
      if (parser_->message_size() > kMaxFrameBytes) return tooLong();
      if (bytes.empty()) return Result::kNeedsMore;
      feed(bytes);
    }
  }

 private:
  bool parse() {
    try {
      return parser_->next();
    } catch (const msgpack::unpack_error&) {
      return visitor_.broken("an extension of an impossible length");
    }
  }

  void feed(std::string_view& bytes) {
    const std::size_t count = std::min(bytes.size(), kSliceBytes);
    parser_->reserve_buffer(kSliceBytes);
    std::memcpy(parser_->buffer(), bytes.data(), count);
    parser_->buffer_consumed(count);
    bytes.remove_prefix(count);
    hasGrown_ = hasGrown_ || parser_->nonparsed_size() > kParserBytes;
  }

  Result endFrame() {
    visitor_.frame().wireBytes = parser_->parsed_size();
    if (visitor_.frame().wireBytes > kMaxFrameBytes) return tooLong();
    isFrameDone_ = true;
    return Result::kFrame;
  }

  Result tooLong() {
    visitor_.broken("a frame that is too long");
    return Result::kBroken;
  }

  void startFrame() {
    isFrameDone_ = false;
    if (hasGrown_) shrink();
    parser_->reset();
  }

  void shrink() {
    auto small = std::make_unique<FrameParser>(visitor_);
    const std::size_t rest = parser_->nonparsed_size();
    small->reserve_buffer(rest);
    std::memcpy(small->buffer(), parser_->nonparsed_buffer(), rest);
    small->buffer_consumed(rest);
    parser_ = std::move(small);
    hasGrown_ = false;
  }

  RpcFrameVisitor visitor_;
  std::unique_ptr<FrameParser> parser_;
  bool isFrameDone_ = false;
  bool hasGrown_ = false;
};

RpcFrameReader::RpcFrameReader(RpcStrings& texts) : parser_(std::make_unique<Parser>(texts)) {}

RpcFrameReader::~RpcFrameReader() = default;

RpcFrameReader::Result RpcFrameReader::next(std::string_view& bytes) { return parser_->next(bytes); }

RpcFrame& RpcFrameReader::frame() { return parser_->visitor().frame(); }

const std::string& RpcFrameReader::problem() const { return parser_->visitor().problem(); }

}  // namespace tonewerk
