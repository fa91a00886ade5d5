// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// What the daemon would leave out of a preference that it knows, and why; empty for one that it does not
// know.
[[nodiscard]] std::vector<std::string> preferenceProblems(std::string_view domain, std::string_view key,
                                                          const Value& value);

// "; did you mean 'max_days'?", for a domain or key that the daemon does not know; empty when nothing is
// close.
std::string preferenceHint(const std::string& domain, const std::optional<std::string>& key);

}  // namespace tonewerk
