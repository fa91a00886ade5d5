// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// Conversion between values and TOML text.
//
// A TOML date with a time and an offset becomes a date; one without an offset (a local date or time) becomes
// a text. TOML's integers are signed, so it cannot express an unsigned value beyond 9223372036854775807. The
// keys of a parsed table are in alphabetical order.

// None if `text` is not TOML; `problem` is then "line:column: what is wrong".
[[nodiscard]] std::optional<ValueMap> parseToml(std::string_view text, std::string& problem);

// A text that parseToml() reads as equal values. None if TOML cannot express a value; `problem` then names
// it.
[[nodiscard]] std::optional<std::string> tomlText(const ValueMap& map, std::string& problem);

// Parses one value as users type it, which is the right side of "key = value". None if it is not one value.
[[nodiscard]] std::optional<Value> parseTomlValue(std::string_view text);

}  // namespace tonewerk
