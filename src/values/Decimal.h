// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// The most characters that digitsOf() writes.
inline constexpr std::size_t kMaxDigits = 32;

// Writes what textOf(number) returns to `to`, which has room for kMaxDigits, and returns its end. Only for a
// finite number.
char* digitsOf(double number, char* to);

}  // namespace tonewerk
