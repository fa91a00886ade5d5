// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Returns the name that differs from `word` by the fewest changes, for a person who has mistyped it; none
// when these are too many for a typing error. Ignores case.
[[nodiscard]] std::optional<std::string> closestTo(std::string_view word,
                                                   const std::vector<std::string>& names);

}  // namespace tonewerk
