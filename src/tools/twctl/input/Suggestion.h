// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Helps who has typed a word that names nothing.

// The name that it takes the fewest changes to get to from `word`; none when it takes too many for a slip.
// Upper and lower case are the same.
[[nodiscard]] std::optional<std::string> closestTo(std::string_view word,
                                                   const std::vector<std::string>& names);

// "did you mean 'events'?"
std::string didYouMean(const std::string& name);

// "there are read, write and delete"
std::string thereAre(const std::vector<std::string>& names);

// The closest name, or else all of them.
std::string hintFor(std::string_view word, const std::vector<std::string>& names);

}  // namespace tonewerk
