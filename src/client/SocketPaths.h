// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

namespace tonewerk {

// Where a daemon may listen, in the order in which to try: TONEWERK_REPORTING_SOCKET alone when it is set,
// else in this process's own runtime directory, then in the system's. A program that runs with more rights
// than its caller has reads no variables of the caller's.
std::vector<std::string> defaultSocketPaths();

}  // namespace tonewerk
