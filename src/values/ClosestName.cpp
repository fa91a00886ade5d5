// SPDX-License-Identifier: Apache-2.0
#include "values/ClosestName.h"

#include <algorithm>
#include <cctype>
#include <cstddef>
#include <numeric>
#include <utility>

namespace tonewerk {
namespace {

char lower(char c) { return static_cast<char>(std::tolower(static_cast<unsigned char>(c))); }

// How many letters must be added, removed, replaced or swapped with their neighbour to turn one text into the
// other.
std::size_t changesBetween(std::string_view from, std::string_view to) {
  std::vector<std::size_t> beforeLast;
  std::vector<std::size_t> last(to.size() + 1);
  std::iota(last.begin(), last.end(), std::size_t{0});
  for (std::size_t row = 1; row <= from.size(); ++row) {
    std::vector<std::size_t> here(to.size() + 1, row);
    for (std::size_t at = 1; at <= to.size(); ++at) {
      const bool isSame = lower(from[row - 1]) == lower(to[at - 1]);
      here[at] = std::min({last[at] + 1, here[at - 1] + 1, last[at - 1] + (isSame ? 0 : 1)});
      const bool isExchanged = row > 1 && at > 1 && lower(from[row - 1]) == lower(to[at - 2]) &&
                               lower(from[row - 2]) == lower(to[at - 1]);
      if (isExchanged) here[at] = std::min(here[at], beforeLast[at - 2] + 1);
    }
    beforeLast = std::exchange(last, std::move(here));
  }
  return last.back();
}

}  // namespace

std::optional<std::string> closestTo(std::string_view word, const std::vector<std::string>& names) {
  // A third of the letters may be wrong, and at least one.
  const std::size_t maxChanges = std::max<std::size_t>(1, (word.size() + 1) / 3);
  std::optional<std::string> closest;
  std::size_t fewest = maxChanges + 1;
  for (const std::string& name : names) {
    const std::size_t changes = changesBetween(word, name);
    if (changes >= fewest || changes >= name.size()) continue;
    fewest = changes;
    closest = name;
  }
  return closest;
}

}  // namespace tonewerk
