// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/StoreSql.h"

#include "platform/linux/store/StoreFile.h"
#include "platform/linux/store/StoreReader.h"

namespace tonewerk {

bool openStoreSql(Tool& tool, SqlReader& reader, std::string& path) {
  const std::string directory = tool.directories().state;
  // It knows which versions of the layout can be read.
  StoreReader check;
  if (check.open(directory) != StoreReader::Outcome::kDone) {
    tool.status = tool.fail(kRefused, check.problem());
    return false;
  }
  path = storeFileIn(directory).path;
  const std::string problem = reader.open(path);
  if (!problem.empty()) tool.status = tool.fail(kRefused, problem);
  return problem.empty();
}

}  // namespace tonewerk
