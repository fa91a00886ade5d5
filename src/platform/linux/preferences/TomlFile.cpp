// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlFile.h"

#include <cerrno>
#include <sys/stat.h>

#include "platform/Log.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/preferences/TomlText.h"

namespace tonewerk {

void TomlFile::refresh() {
  if (stamp_ || isMissing_) {
    struct stat status {};
    const bool isThere = stat(path_.c_str(), &status) == 0;
    if (stamp_ && isThere && FileStamp::of(status) == *stamp_) return;
    if (isMissing_ && !isThere && errno == ENOENT) return;
  }
  read();
}

void TomlFile::read() {
  stamp_.reset();
  std::string text;
  struct stat status {};
  const std::error_code error = readFileBytes(path_, text, &status);
  isMissing_ = error == std::errc::no_such_file_or_directory;
  if (isMissing_) {
    values_ = {};
    problem_.clear();
    return;
  }
  if (error) return fail(path_ + ": " + error.message(), std::nullopt);

  const FileStamp stamp = FileStamp::of(status);
  if (stamp.isSettled()) stamp_ = stamp;
  std::string problem;
  std::optional<ValueMap> values = parseToml(text, problem);
  if (!values) return fail(path_ + ":" + problem, stamp);
  values_ = std::move(*values);
  problem_.clear();
}

void TomlFile::fail(const std::string& problem, const std::optional<FileStamp>& found) {
  values_ = {};
  if (problem == problem_ && found == loggedStamp_) return;
  problem_ = problem;
  loggedStamp_ = found;
  errorLog(log_, "%s (read as empty)", problem_);
}

}  // namespace tonewerk
