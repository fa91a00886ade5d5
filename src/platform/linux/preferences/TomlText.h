// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// Values as TOML text and back.
//
// TOML's dates with a time and an offset are dates; those without one (local dates, times) become texts.
// TOML's integers are signed: an unsigned value beyond 9223372036854775807 cannot be said. Tables come back
// with their keys in alphabetical order.

// None when `text` is no TOML; `problem` is then "line:column: what is wrong".
[[nodiscard]] std::optional<ValueMap> parseToml(std::string_view text, std::string& problem);

// A text that parseToml() reads as equal values. None for values that TOML cannot say, named in `problem`.
[[nodiscard]] std::optional<std::string> tomlText(const ValueMap& map, std::string& problem);

// One value on the right side of "key = value", as people type it.
[[nodiscard]] std::optional<Value> parseTomlValue(std::string_view text);

}  // namespace tonewerk
