// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// The problems because of which the daemon would ignore a preference or a part of it. Empty for a preference
// that it does not know.
[[nodiscard]] std::vector<std::string> preferenceProblems(std::string_view domain, std::string_view key,
                                                          const Value& value);

// "; did you mean 'max_days'?", for a domain or key that the daemon does not know; empty when nothing is
// close.
std::string preferenceHint(const std::string& domain, const std::optional<std::string>& key);

}  // namespace tonewerk
