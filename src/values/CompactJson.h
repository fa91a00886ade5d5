// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "values/Value.h"
#include "values/ValueView.h"

namespace tonewerk {

// Appends `value` as JSON without white space. Dates become RFC 3339 texts. A double always gets a fraction
// or an exponent (2.0), so that it reads back as a double. NaN and the infinities, which JSON cannot express,
// become null.
//
// The text of a packed map is that of its tree, and is made without one.
void appendCompactJson(std::string& out, ValueView value);
void appendCompactJson(std::string& out, const ValueMap& map);
// Without the entry `hidden`; an empty key hides nothing.
void appendCompactJson(std::string& out, const ValueMap& map, std::string_view hidden);
void appendJsonText(std::string& out, std::string_view text);

}  // namespace tonewerk
