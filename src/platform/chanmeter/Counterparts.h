// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <vector>

namespace tonewerk {

// Returns, for each element of `later`, the element of `earlier` with the same key; null when there is none.
// The n-th element with a key is matched with the n-th in `earlier` with that key. The pointers point into
// `earlier`. O(n log n); O(n) for the part at the beginning where both have the same keys, which is all of it
// when nothing was added or removed.
template <typename T, typename KeyOf>
std::vector<const T*> counterparts(const std::vector<T>& earlier, const std::vector<T>& later,
                                   const KeyOf& keyOf) {
  std::vector<const T*> found(later.size(), nullptr);
  const std::size_t shorter = std::min(earlier.size(), later.size());
  std::size_t begin = 0;
  for (; begin < shorter && keyOf(earlier[begin]) == keyOf(later[begin]); ++begin)
    found[begin] = &earlier[begin];
  if (begin == later.size()) return found;

  const auto sortedRest = [&](const std::vector<T>& items) {
    std::vector<const T*> rest;
    for (std::size_t i = begin; i < items.size(); ++i) rest.push_back(&items[i]);
    std::stable_sort(rest.begin(), rest.end(), [&](const T* a, const T* b) { return keyOf(*a) < keyOf(*b); });
    return rest;
  };
  const std::vector<const T*> before = sortedRest(earlier);
  const std::vector<const T*> after = sortedRest(later);
  auto b = before.begin();
  for (auto a = after.begin(); a != after.end() && b != before.end();) {
    if (keyOf(**b) < keyOf(**a)) {
      ++b;
    } else if (keyOf(**a) < keyOf(**b)) {
      ++a;
    } else {
      found[static_cast<std::size_t>(*a++ - later.data())] = *b++;
    }
  }
  return found;
}

}  // namespace tonewerk
