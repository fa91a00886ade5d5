// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// The SQL that turns a file into one as the first daemons of this version made it: without the marks of age.
inline std::string intoVersion2WithoutAges() { return "DROP TABLE age_mark; DROP TABLE age_clock;"; }

}  // namespace tonewerk
