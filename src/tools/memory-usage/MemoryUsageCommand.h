// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <iosfwd>

namespace tonewerk {

// Everything that tw-memory-usage does. Gives its exit status: 0 done, 1 nothing could be read or written, 2
// wrong usage.
[[nodiscard]] int runMemoryUsage(int argc, const char* const* argv, std::ostream& out, std::ostream& err);

}  // namespace tonewerk
