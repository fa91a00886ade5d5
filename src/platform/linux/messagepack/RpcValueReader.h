// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// The position of a value in a frame. A result may be nested one level deeper than an argument, and its texts
// may contain noncharacters.
enum class ValuePlace { kArgument, kResult };

// Reads `bytes` as exactly one value. None for nil and for anything that a frame may not hold at that place.
[[nodiscard]] std::optional<Value> readValue(std::string_view bytes, ValuePlace place);

}  // namespace tonewerk
