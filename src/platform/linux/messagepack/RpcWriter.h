// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// Appends frames of the protocol, and parts of them, to a buffer.
class RpcWriter {
 public:
  // `out` outlives the writer.
  explicit RpcWriter(std::string& out) : out_(out) {}

  // head() writes the start of a request, or of a notification when there is no identifier; body() writes the
  // rest of either.
  static constexpr std::size_t kMaxHeadBytes = 7;
  void head(std::optional<std::uint32_t> identifier);
  void body(std::string_view method, const Arguments& arguments);

  void request(std::uint32_t identifier, std::string_view method, const Arguments& arguments);
  void notification(std::string_view method, const Arguments& arguments);
  // A missing `error` or `result` is written as nil.
  void response(std::uint32_t identifier, const std::optional<ReplyError>& error,
                const std::optional<Value>& result);

  // Writes a single value, without a frame.
  void value(const Value& value);

 private:
  void success(std::uint32_t identifier);

  std::string& out_;
};

// True when a frame with these arguments is not nested deeper than kMaxFrameDepth.
[[nodiscard]] bool fitsFrameDepth(const Arguments& arguments);

}  // namespace tonewerk
