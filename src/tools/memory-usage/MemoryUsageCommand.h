// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <iosfwd>

namespace tonewerk {

// Runs tw-memory-usage and returns its exit status: 0 for success, 1 if reading or writing failed, 2 for
// wrong usage.
[[nodiscard]] int runMemoryUsage(int argc, const char* const* argv, std::ostream& out, std::ostream& err);

}  // namespace tonewerk
