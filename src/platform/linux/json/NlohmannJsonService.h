// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/JsonService.h"

namespace tonewerk {

// JSON written by the values' own compact writer, and read by a JSON library. Pretty text is indented by two
// spaces and ends without a newline; a double keeps a fraction or an exponent (2.0). An integer beyond the
// 64-bit ones reads as a double; of a key given twice the last wins; values nested deeper than 200 are
// refused.
class NlohmannJsonService final : public JsonService {
 public:
  std::string compact(const ValueMap& map) const override;
  // A problem reads "a.b[2] is nan, which JSON cannot say".
  [[nodiscard]] std::optional<std::string> pretty(const ValueMap& map, std::string& problem) const override;
  // A problem reads "a.b[2] is null" or is the library's, with line and column.
  [[nodiscard]] std::optional<Value> parse(std::string_view text, std::string& problem) const override;
};

}  // namespace tonewerk
