// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/TomlFile.h"

#include <cstdint>
#include <ctime>

#include "platform/LogLine.h"
#include "platform/linux/TextFile.h"
#include "platform/linux/TomlText.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kSecond = 1'000'000'000;

std::int64_t nanosecondsOf(const timespec& time) { return time.tv_sec * kSecond + time.tv_nsec; }

}  // namespace

TomlFile::Stamp TomlFile::stampOf(const struct stat& status) {
  return {status.st_dev, status.st_ino, status.st_size, nanosecondsOf(status.st_mtim),
          nanosecondsOf(status.st_ctim)};
}

// File times move in ticks of some milliseconds, and a new file may get the number of one that is gone. So a
// file that changed just now may change again without a trace in its stamp; after a second it cannot.
bool TomlFile::isSettled(const Stamp& stamp) {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return nanosecondsOf(now) - stamp.changedNanoseconds > kSecond;
}

void TomlFile::refresh() {
  struct stat status {};
  if (stamp_ && stat(path_.c_str(), &status) == 0 && stampOf(status) == *stamp_) return;
  read();
}

void TomlFile::read() {
  stamp_.reset();
  std::string text;
  struct stat status {};
  const std::error_code error = readTextFile(path_, text, &status);
  if (error == std::errc::no_such_file_or_directory) {
    values_ = {};
    problem_.clear();
    return;
  }
  if (error) return fail(path_ + ": " + error.message());

  const Stamp stamp = stampOf(status);
  if (isSettled(stamp)) stamp_ = stamp;
  std::string problem;
  std::optional<ValueMap> values = parseToml(text, problem);
  if (!values) return fail(path_ + ":" + problem);
  values_ = std::move(*values);
  problem_.clear();
}

void TomlFile::fail(const std::string& problem) {
  values_ = {};
  if (problem == problem_) return;
  problem_ = problem;
  errorLog(log_, "%s (read as empty)", problem_);
}

}  // namespace tonewerk
