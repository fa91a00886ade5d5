// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <system_error>

#include "platform/Log.h"
#include "platform/linux/files/FileStamp.h"
#include "values/Value.h"

namespace tonewerk {

// One TOML file that others may rewrite at any time, and what was last read from it. One thread at a time.
class TomlFile {
 public:
  // `log` outlives the file.
  TomlFile(std::string path, const LogCategory& log) : path_(std::move(path)), log_(log) {}

  // Looks at the file, and reads it unless it is for certain the one that was read last. A file that cannot
  // be read or does not parse is logged with line and column, once until it is written again.
  void refresh();

  // As of the last refresh(). Empty when there is no such file and when problem() says why it cannot be read.
  const ValueMap& values() const { return values_; }
  const std::string& problem() const { return problem_; }
  const std::string& path() const { return path_; }

 private:
  void read();
  // `found` is the file that has the problem, none where it could not be opened.
  void fail(const std::string& problem, const std::optional<FileStamp>& found);

  const std::string path_;
  const LogCategory& log_;
  std::optional<FileStamp> stamp_;  // of what was read; none when it cannot be trusted to tell a later state
  ValueMap values_;
  std::string problem_;
  std::optional<FileStamp> saidOf_;  // the file whose problem was logged last
};

}  // namespace tonewerk
