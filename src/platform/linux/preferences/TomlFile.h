// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <system_error>

#include "platform/Log.h"
#include "platform/linux/files/FileStamp.h"
#include "values/Value.h"

namespace tonewerk {

// Holds the values of one TOML file that other processes may rewrite at any time. One thread at a time.
class TomlFile {
 public:
  // `log` must outlive this object.
  TomlFile(std::string path, const LogCategory& log) : path_(std::move(path)), log_(log) {}

  // Reads the file again, unless it certainly has not changed. A file that cannot be read or parsed is logged
  // once, with line and column, until it is written again.
  void refresh();

  // The values at the last refresh(). Empty if there is no file, or if problem() says why it cannot be read.
  const ValueMap& values() const { return values_; }
  const std::string& problem() const { return problem_; }
  const std::string& path() const { return path_; }

 private:
  void read();
  // `found` is the stamp of the file that has the problem; none if it could not be opened.
  void fail(const std::string& problem, const std::optional<FileStamp>& found);

  const std::string path_;
  const LogCategory& log_;
  std::optional<FileStamp> stamp_;  // of the file that was read; none if a change might not alter the stamp
  bool isMissing_ = false;          // the last read() found no file
  ValueMap values_;
  std::string problem_;
  std::optional<FileStamp> loggedStamp_;  // of the file whose problem was logged last
};

}  // namespace tonewerk
