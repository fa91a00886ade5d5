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

  // What a request and a notification (without an identifier) begin with, and what follows in both.
  static constexpr std::size_t kMaxHeadBytes = 7;
  void head(std::optional<std::uint32_t> identifier);
  void body(std::string_view method, const Arguments& arguments);

  void request(std::uint32_t identifier, std::string_view method, const Arguments& arguments);
  void notification(std::string_view method, const Arguments& arguments);
  // `error` and `result` none are nil.
  void response(std::uint32_t identifier, const std::optional<ReplyError>& error,
                const std::optional<Value>& result);

  // A value by itself.
  void value(const Value& value);

 private:
  std::string& out_;
};

// Whether a frame with these arguments is nested no deeper than a frame may be.
[[nodiscard]] bool fitsFrameDepth(const Arguments& arguments);

}  // namespace tonewerk
