// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/JsonService.h"

namespace tonewerk {

// Implements JSON without the daemon's JSON adapter: compact text by the values' own writer, and pretty text
// with an indentation of two spaces. Any thread.
class MemoryJsonService final : public JsonService {
 public:
  std::string compact(const ValueMap& map) const override;
  [[nodiscard]] std::optional<std::string> pretty(const ValueMap& map, std::string& problem) const override;
  [[nodiscard]] std::optional<Value> parse(std::string_view text, std::string& problem) const override;
};

}  // namespace tonewerk
