// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

class Value;

// Whether arrays and maps lie inside each other in `value` at most `levels` deep; a value that is neither has
// none. O(values).
bool nestsWithin(const Value& value, std::size_t levels);

}  // namespace tonewerk
