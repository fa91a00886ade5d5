// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// Makes text from clients and publishers safe for a terminal: replaces each control character by '?', also
// those that take two bytes in UTF-8.
std::string printable(std::string text);

}  // namespace tonewerk
