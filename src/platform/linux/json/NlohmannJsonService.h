// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/JsonService.h"

namespace tonewerk {

// Writes JSON with the values' own writers and reads it with a JSON library. Pretty text is indented
// by two spaces and has no newline at the end. A double always has a fraction or an exponent (2.0). An
// integer beyond 64 bits is read as a double. If an object has a key twice, the last one counts. Values
// nested deeper than 200 levels are refused.
class NlohmannJsonService final : public JsonService {
 public:
  std::string compact(const ValueMap& map) const override;
  // Example of a problem: "a.b[2] is nan, which JSON cannot say".
  [[nodiscard]] std::optional<std::string> pretty(const ValueMap& map, std::string& problem) const override;
  // A problem is a text like "a.b[2] is null", or the library's message with line and column.
  [[nodiscard]] std::optional<Value> parse(std::string_view text, std::string& problem) const override;
};

}  // namespace tonewerk
