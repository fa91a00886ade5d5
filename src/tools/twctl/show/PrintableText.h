// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// What clients and publishers chose, for a terminal: with a '?' for each control character, those that UTF-8
// writes in two bytes included.
std::string printable(std::string text);

}  // namespace tonewerk
