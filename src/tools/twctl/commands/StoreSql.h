// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "tools/twctl/Tool.h"
#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// Opens the store of the chosen daemon for SQL, and sets `path` to its file. False when it cannot be read;
// the problem is then printed, and the tool's exit status is set.
[[nodiscard]] bool openStoreSql(Tool& tool, SqlReader& reader, std::string& path);

}  // namespace tonewerk
