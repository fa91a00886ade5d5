// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// Where in a frame a value has its place. A result may nest one deeper than an argument, and its texts may
// hold noncharacters.
enum class ValuePlace { kArgument, kResult };

// The one value that `bytes` are. None for nil, and for everything that no frame could carry in that place.
[[nodiscard]] std::optional<Value> readValue(std::string_view bytes, ValuePlace place);

}  // namespace tonewerk
