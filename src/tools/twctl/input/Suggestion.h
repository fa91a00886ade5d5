// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Suggestions for a person who has typed an unknown name.

// "did you mean 'events'?"
std::string didYouMean(const std::string& name);

// "there are read, write and delete"
std::string thereAre(const std::vector<std::string>& names);

// The closest name, or else all of them.
std::string hintFor(std::string_view word, const std::vector<std::string>& names);

}  // namespace tonewerk
