// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// A value in a frame that the protocol does not allow.
struct RefusedValue {
  std::size_t argument = 0;  // its index among the arguments
  const char* what = "";     // the text after "argument 1 (message) "
};

// One message of the protocol.
struct RpcFrame {
  enum class Kind { kRequest, kResponse, kNotification };

  Kind kind = Kind::kRequest;
  std::uint32_t identifier = 0;  // of requests and responses

  // Of requests and notifications. Each refused value is replaced by a placeholder among the arguments.
  std::string method;
  Arguments arguments;

  // Of responses; nil is read as none.
  std::optional<Value> error;
  std::optional<Value> result;

  std::optional<RefusedValue> refused;  // the first one
  std::size_t wireBytes = 0;
};

}  // namespace tonewerk
