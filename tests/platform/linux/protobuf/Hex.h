// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdlib>
#include <string>
#include <string_view>

namespace tonewerk {

// Converts pairs of hexadecimal digits into bytes: fromHex("94 00") is two bytes.
inline std::string fromHex(std::string_view digits) {
  std::string bytes;
  std::string pair;
  for (const char digit : digits) {
    if (digit == ' ') continue;
    pair += digit;
    if (pair.size() < 2) continue;
    bytes += static_cast<char>(std::strtol(pair.c_str(), nullptr, 16));
    pair.clear();
  }
  return bytes;
}

}  // namespace tonewerk
