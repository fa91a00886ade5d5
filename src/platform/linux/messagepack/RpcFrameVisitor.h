// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/messagepack/RpcFrame.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcValueReader.h"

namespace tonewerk {

// Builds one frame out of the events of a MessagePack parser: straight into the frame's arguments, without a
// tree in between. The functions with underscores are named by the parser, which calls them; they return
// false to stop it.
class RpcFrameVisitor {
 public:
  explicit RpcFrameVisitor(RpcStrings& texts) : texts_(texts) {}

  RpcFrame& frame() { return frame_; }
  const std::string& problem() const { return problem_; }
  // The frame cannot be one. Always false.
  bool broken(std::string problem);

  // Before every frame.
  void init();
  // Before a value by itself, which goes where it would in a frame.
  void initAt(ValuePlace place);

  [[nodiscard]] bool visit_nil();
  [[nodiscard]] bool visit_boolean(bool value) { return put(Value(value)); }
  [[nodiscard]] bool visit_positive_integer(std::uint64_t value);
  [[nodiscard]] bool visit_negative_integer(std::int64_t value);
  [[nodiscard]] bool visit_float32(float value) { return put(Value(static_cast<double>(value))); }
  [[nodiscard]] bool visit_float64(double value) { return put(Value(value)); }
  [[nodiscard]] bool visit_str(const char* data, std::uint32_t size);
  [[nodiscard]] bool visit_bin(const char* data, std::uint32_t size);
  [[nodiscard]] bool visit_ext(const char* data, std::uint32_t size);
  [[nodiscard]] bool start_array(std::uint32_t count);
  bool start_array_item() { return true; }
  bool end_array_item() { return true; }
  [[nodiscard]] bool end_array();
  [[nodiscard]] bool start_map(std::uint32_t count);
  bool start_map_key();
  bool end_map_key() { return true; }
  bool start_map_value();
  bool end_map_value() { return true; }
  [[nodiscard]] bool end_map();
  void parse_error(std::size_t, std::size_t) { broken("bytes that are not MessagePack"); }
  void insufficient_bytes(std::size_t, std::size_t) {}
  bool referenced() const { return false; }

 private:
  // An array or map that is still open.
  struct Container {
    bool isMap = false;
    bool awaitsKey = false;
    SharedString key;
    ValueMap map;
    std::uint64_t keyBits = 0;  // one bit of each key's hash; a key without its bit here is new
    std::vector<Value> values;
  };

  // The frame's own array is depth 1, the arguments' is depth 2; what they hold goes into the frame itself.
  bool isInFrame() const { return depth_ == 1; }
  bool isInArguments() const { return depth_ == 2 && isReadingArguments_; }
  bool isKeyAwaited() const { return depth_ > 1 && !isInArguments() && containers_[depth_ - 1].awaitsKey; }

  [[nodiscard]] bool open(bool isMap, std::uint32_t count);
  [[nodiscard]] bool startFrame(std::uint32_t count);
  bool startArguments(std::uint32_t count);
  [[nodiscard]] bool put(Value value);
  [[nodiscard]] bool putInFrame(Value value);
  [[nodiscard]] bool setKind(const Value& value);
  [[nodiscard]] bool setIdentifier(const Value& value);
  [[nodiscard]] bool setMethod(std::string_view text);
  static void putInMap(Container& container, Value value);
  [[nodiscard]] bool putKey(std::string_view text);
  [[nodiscard]] std::optional<SharedString> sharedText(StringInterner& cache, std::string_view text) const;
  // Notes the first value that the protocol does not carry and goes on with a stand-in for it.
  bool refuse(const char* what);

  RpcStrings& texts_;
  RpcFrame frame_;
  std::string problem_;
  std::size_t depth_ = 0;
  std::size_t frameSize_ = 0;   // elements of the frame's array
  std::size_t framePlace_ = 0;  // the element that comes next
  bool isReadingArguments_ = false;
  std::array<Container, kMaxFrameDepth> containers_;
};

}  // namespace tonewerk
