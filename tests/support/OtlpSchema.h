// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Checks the JSON of a logs export request against its whole schema, as the strictest receiver would. Returns
// one text for each problem, with the place where it was found; empty when nothing is wrong.
//
// It requires: no unknown keys and no key twice; 64-bit integers as decimal texts within their range,
// identifiers in hex, bytes in base64; a value of exactly one kind; attribute keys that are neither empty nor
// repeated; times that are set.
std::vector<std::string> problemsOfOtlpLogs(std::string_view json);

}  // namespace tonewerk
