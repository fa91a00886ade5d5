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

// Builds one frame from the events of a MessagePack parser, directly into the frame's arguments and without a
// tree of objects. The parser requires the functions with underscores in their names; they return false to
// stop it.
class RpcFrameVisitor {
 public:
  explicit RpcFrameVisitor(RpcStrings& texts) : texts_(texts) {}

  RpcFrame& frame() { return frame_; }
  const std::string& problem() const { return problem_; }
  // Notes that the bytes are not a frame. Always returns false.
  bool broken(std::string problem);

  // Call it before every frame.
  void init();
  // Call it before a single value, which is then read as if it were at `place` in a frame.
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
    std::uint64_t keyBits = 0;  // one bit per key's hash; a key whose bit is not set is new
    std::vector<Value> values;
  };

  // The frame's own array has depth 1, that of the arguments depth 2. Their elements go directly into the
  // frame.
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
  // Notes the first value that the protocol does not allow, and puts a placeholder in its place. Always
  // returns true.
  bool refuse(const char* what);

  RpcStrings& texts_;
  RpcFrame frame_;
  std::string problem_;
  std::size_t depth_ = 0;
  std::size_t frameSize_ = 0;   // elements of the frame's array
  std::size_t framePlace_ = 0;  // index of the next element
  bool isReadingArguments_ = false;
  std::array<Container, kMaxFrameDepth> containers_;
};

}  // namespace tonewerk
