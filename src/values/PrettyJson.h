// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// Appends `map` as JSON for people: each entry has a line, and each level is indented by two more spaces. No
// newline follows the text. Values are written as compact JSON writes them (values/CompactJson.h).
//
// Returns false when the map holds a number that JSON cannot express (NaN, an infinity). Then `out` is as it
// was, and `problem` names the first such number, as in "a.b[2] is nan, which JSON cannot say".
//
// The text of a packed map is that of its tree, and is made without one.
[[nodiscard]] bool appendPrettyJson(std::string& out, const ValueMap& map, std::string& problem);

// The same for a map whose only entry is `map` under the key `member`.
[[nodiscard]] bool appendPrettyJson(std::string& out, std::string_view member, const ValueMap& map,
                                    std::string& problem);

}  // namespace tonewerk
