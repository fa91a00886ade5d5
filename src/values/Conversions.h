// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>

namespace tonewerk {

// The conversions of a text and of a double, as Value describes them.

bool booleanOfText(std::string_view text);
std::int64_t integerOfText(std::string_view text);
double numberOfText(std::string_view text);
std::int64_t saturatedInteger(double number);

}  // namespace tonewerk
