// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tonewerk {

// The file of the report store in a directory.
struct StoreFile {
  std::string path;
  // When a newer version made the directory's "reports.db", that file is left alone, and the store is in the
  // one beside it: the newer one's schema version.
  std::optional<std::int64_t> newerSchema;
};

// Finds the file that this version uses in `directory`, which need not exist. Changes nothing there. A daemon
// and a tool of one version find the same file.
StoreFile storeFileIn(const std::string& directory);

}  // namespace tonewerk
