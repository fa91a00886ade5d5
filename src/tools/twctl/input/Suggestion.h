// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Suggestions for a person who has typed an unknown name.

// The name that differs from `word` by the fewest changes; none when these are too many for a typing error.
// Ignores case.
[[nodiscard]] std::optional<std::string> closestTo(std::string_view word,
                                                   const std::vector<std::string>& names);

// "did you mean 'events'?"
std::string didYouMean(const std::string& name);

// "there are read, write and delete"
std::string thereAre(const std::vector<std::string>& names);

// The closest name, or else all of them.
std::string hintFor(std::string_view word, const std::vector<std::string>& names);

}  // namespace tonewerk
