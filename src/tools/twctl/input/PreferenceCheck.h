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

// The domains that the daemon knows, without the facts.
std::vector<std::string> preferenceDomains();

// "; did you mean 'max_days'?", for a domain or key that the daemon does not know. When no key is close, it
// lists the keys of a known domain; empty when no domain is close.
std::string preferenceHint(const std::string& domain, const std::optional<std::string>& key);

}  // namespace tonewerk
