// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

class Value;

// Returns whether arrays and maps are nested at most `levels` deep in `value`. A value that is neither an
// array nor a map has no level. O(number of values).
bool nestsWithin(const Value& value, std::size_t levels);

}  // namespace tonewerk
