// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/Suggestion.h"

#include <cstddef>
#include <optional>

#include "values/ClosestName.h"

namespace tonewerk {

std::string didYouMean(const std::string& name) { return "did you mean '" + name + "'?"; }

std::string thereAre(const std::vector<std::string>& names) {
  std::string text = "there are ";
  for (std::size_t at = 0; at < names.size(); ++at) {
    if (at > 0) text += at + 1 == names.size() ? " and " : ", ";
    text += names[at];
  }
  return text;
}

std::string hintFor(std::string_view word, const std::vector<std::string>& names) {
  const std::optional<std::string> meant = closestTo(word, names);
  return meant ? didYouMean(*meant) : thereAre(names);
}

}  // namespace tonewerk
