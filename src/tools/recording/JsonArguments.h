// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

class JsonService;

// Reads a JSON object. Its member `parameters`, if it has one, is an array of arguments, in which null stands
// for no argument; its other members become values in `members`. Returns the problem, or an empty text.
[[nodiscard]] std::string parseJsonCall(std::string_view line, std::string_view parameters,
                                        const JsonService& json, ValueMap& members, Arguments& arguments,
                                        bool& hasParameters);

}  // namespace tonewerk
