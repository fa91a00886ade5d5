// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// JSON text out of values and back. Any thread.
class JsonService {
 public:
  virtual ~JsonService() = default;

  // Without white space, for the store: NaN and infinities become null. Dates become RFC 3339 texts.
  virtual std::string compact(const ValueMap& map) const = 0;

  // Indented over several lines, for people. None when the map holds what JSON cannot say (NaN, an infinity);
  // then `problem` names it.
  [[nodiscard]] virtual std::optional<std::string> pretty(const ValueMap& map,
                                                          std::string& problem) const = 0;

  // None when `text` is not one JSON value that values can express (null is not); then `problem` says where.
  [[nodiscard]] virtual std::optional<Value> parse(std::string_view text, std::string& problem) const = 0;
};

}  // namespace tonewerk
