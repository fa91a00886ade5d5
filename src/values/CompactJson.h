// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "values/Value.h"

namespace tonewerk {

// Appends `value` as JSON without white space. Dates become RFC 3339 texts. A double always gets a fraction
// or an exponent (2.0), so that it reads back as a double. NaN and the infinities, which JSON cannot express,
// become null.
void appendCompactJson(std::string& out, const Value& value);
void appendCompactJson(std::string& out, const ValueMap& map);

}  // namespace tonewerk
