// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Holds the JSON of a logs export request to the whole of its schema: what a receiver that forgives nothing
// would say about it, one text a problem with the place it was found at. Empty when nothing is wrong.
//
// No unknown keys, none twice; 64-bit integers as decimal texts within their range, identifiers in hex, bytes
// in base64; a value of exactly one kind; keys of attributes not empty and not twice; times that are set.
std::vector<std::string> problemsOfOtlpLogs(std::string_view json);

}  // namespace tonewerk
