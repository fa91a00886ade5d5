// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// The bytes of a JSON object to leave out, so that what remains is the object without one of its entries.
struct JsonCut {
  std::size_t begin = 0;
  std::size_t size = 0;  // 0 when nothing is left out
};

// Returns the cut for the entry `key` of `map`, whose compact JSON is `json`. An entry that is not there
// needs no cut.
//
// It searches the text instead of parsing it, so it returns none in unusual cases: when the key has
// characters other than letters, digits and '_', when the value is no number, and when a nested map may have
// the key. An entry at the beginning is found fastest.
std::optional<JsonCut> cutOfEntry(std::string_view json, const ValueMap& map, std::string_view key);

}  // namespace tonewerk
