// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tonewerk {

struct Tool;

// Colours are for terminals, and sparing: what is read must not need them.
namespace colours {

inline constexpr const char* kRed = "\x1b[31m";  // errors
inline constexpr const char* kDim = "\x1b[2m";   // what the daemon has derived, and what is of less interest
inline constexpr const char* kEnd = "\x1b[0m";

// Whether the tool prints to a terminal that can show colours, and the variable NO_COLOR is empty.
bool areWanted(const Tool& tool);

}  // namespace colours
}  // namespace tonewerk
