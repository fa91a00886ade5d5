// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tonewerk {

// Whether a terminal of this type (the variable TERM) can place its cursor; false for an unknown type, and
// for "dumb". Changes nothing. newterm() would have changed the terminal's modes before it finds that out, or
// even end the process.
[[nodiscard]] bool canShowPages(const char* type, int descriptor);

}  // namespace tonewerk
