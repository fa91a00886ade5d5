// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// A value that the protocol does not carry, met while a frame was read.
struct RefusedValue {
  std::size_t argument = 0;  // its place among the arguments
  const char* what = "";     // as it continues "argument 1 (message) "
};

// One message of the protocol.
struct RpcFrame {
  enum class Kind { kRequest, kResponse, kNotification };

  Kind kind = Kind::kRequest;
  std::uint32_t identifier = 0;  // of requests and responses

  // Of requests and notifications. With a refused value (the first one met) the arguments hold stand-ins.
  std::string method;
  Arguments arguments;

  // Of responses; none is nil.
  std::optional<Value> error;
  std::optional<Value> result;

  std::optional<RefusedValue> refused;
  std::size_t wireBytes = 0;
};

}  // namespace tonewerk
