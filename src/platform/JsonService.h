// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// Converts values to JSON text and back. Any thread.
class JsonService {
 public:
  virtual ~JsonService() = default;

  // Returns JSON without white space, for the store. NaN and infinities become null, dates RFC 3339 texts.
  virtual std::string compact(const ValueMap& map) const = 0;

  // Returns JSON with indentation, for people. Returns none when the map holds a number that JSON cannot
  // express (NaN, an infinity); `problem` then names it.
  [[nodiscard]] virtual std::optional<std::string> pretty(const ValueMap& map,
                                                          std::string& problem) const = 0;

  // Returns none when `text` is not one JSON value that Value can hold (null is not); `problem` then says
  // where.
  [[nodiscard]] virtual std::optional<Value> parse(std::string_view text, std::string& problem) const = 0;
};

}  // namespace tonewerk
