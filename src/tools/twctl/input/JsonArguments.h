// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

class JsonService;

// Reads a JSON object with one member `parameters`, an array of arguments in which null stands for none, and
// other members, which become values. What is wrong, or an empty text.
[[nodiscard]] std::string parseJsonCall(std::string_view line, std::string_view parameters,
                                        const JsonService& json, ValueMap& members, Arguments& arguments);

}  // namespace tonewerk
