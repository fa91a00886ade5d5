// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/SummaryDirectory.h"

#include <algorithm>
#include <tuple>
#include <vector>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr double kMegabyte = 1 << 20;
constexpr double kDefaultMegabytes = 256;
constexpr double kDay = 86'400;
constexpr double kDefaultDays = 30;
// When files are removed because of their size, they make room for some more, so that not each new file has
// the directory read.
constexpr double kFillAgain = 0.95;

// The clock of a file system may be this much ahead.
constexpr double kClockSeconds = 60;

bool isDigit(char c) { return c >= '0' && c <= '9'; }

bool isNumber(const Value& value) {
  return value.asInteger() != nullptr || value.asUnsigned() != nullptr || value.asDouble() != nullptr;
}

}  // namespace

bool SummaryDirectory::isSummaryName(std::string_view name) {
  constexpr std::string_view kPattern = "dddddddd-dddddd+dddd-";
  if (name.size() <= kPattern.size() || !name.ends_with(".json")) return false;
  for (std::size_t at = 0; at < kPattern.size(); ++at) {
    const bool suits = kPattern[at] == 'd'   ? isDigit(name[at])
                       : kPattern[at] == '+' ? name[at] == '+' || name[at] == '-'
                                             : name[at] == kPattern[at];
    if (!suits) return false;
  }
  return true;
}

void SummaryDirectory::tidy() {
  TWReportingContext::current().platform().files.removeLeftovers(path_);
  trim(readBounds());
}

void SummaryDirectory::added(std::uint64_t bytes) {
  const Bounds bounds = readBounds();
  bytes_ += static_cast<double>(bytes);
  const std::chrono::nanoseconds now = TWReportingContext::current().platform().clock.monotonic();
  if (!readAt_ || bytes_ > bounds.bytes || now - *readAt_ >= kReadInterval) trim(bounds);
}

SummaryDirectory::Bounds SummaryDirectory::readBounds() {
  std::string wrong;
  const Bounds bounds{bound(kMegabytesKey, kDefaultMegabytes, wrong) * kMegabyte,
                      bound(kDaysKey, kDefaultDays, wrong) * kDay};
  if (!wrong.empty() && wrong != loggedWrongBounds_) {
    errorLog(TWReportingSummaryLogCategory(), "preferences of %s that are no number from 1 are left out:%s",
             kPreferenceDomain, wrong);
  }
  loggedWrongBounds_ = wrong;
  return bounds;
}

double SummaryDirectory::bound(std::string_view key, double otherwise, std::string& wrong) const {
  const std::optional<Value> value =
      TWReportingContext::current().platform().preferences.read(kPreferenceDomain, key);
  if (!value) return otherwise;
  if (isNumber(*value) && value->number() >= 1.0) return value->number();
  wrong += " " + std::string(key) + " = " + value->text();
  return otherwise;
}

void SummaryDirectory::trim(const Bounds& bounds) {
  const Platform& platform = TWReportingContext::current().platform();
  std::error_code error;
  std::vector<FileEntry> files = platform.files.listFiles(path_, error);
  const std::string problem = error && error != std::errc::no_such_file_or_directory ? error.message() : "";
  if (!problem.empty() && problem != loggedProblem_) {
    errorLog(TWReportingSummaryLogCategory(), "cannot read %@, so it is not kept within its bounds: %@",
             path_, problem);
  }
  loggedProblem_ = problem;
  readAt_ = platform.clock.monotonic();
  std::erase_if(files, [](const FileEntry& file) { return !isSummaryName(file.name); });
  const double now = platform.clock.now();
  // What was written while the clock was ahead would count as the newest, and new files as the oldest.
  const auto isFuture = [now](const FileEntry& file) { return file.modifiedAt > now + kClockSeconds; };
  std::sort(files.begin(), files.end(), [&](const FileEntry& a, const FileEntry& b) {
    if (isFuture(a) != isFuture(b)) return isFuture(a);
    return std::tie(a.modifiedAt, a.name) < std::tie(b.modifiedAt, b.name);
  });
  bytes_ = 0.0;
  for (const FileEntry& file : files) bytes_ += static_cast<double>(file.bytes);
  if (files.empty()) return;
  const double witness = files.size() > kWitnesses ? files[files.size() - kWitnesses].modifiedAt : 0.0;
  const double oldest = std::min(now, witness) - bounds.seconds;
  files.pop_back();  // the newest one stays
  const bool isTooLarge = bytes_ > bounds.bytes;
  std::size_t removed = 0;
  for (const FileEntry& file : files) {
    const bool isOld = file.modifiedAt < oldest;
    if (!isOld && !(isTooLarge && bytes_ > bounds.bytes * kFillAgain)) {
      if (isFuture(file)) continue;
      break;
    }
    if (!remove(file)) continue;
    bytes_ -= static_cast<double>(file.bytes);
    ++removed;
  }
  if (removed > 0) {
    infoLog(TWReportingSummaryLogCategory(), "removed the oldest summary files of %@: %zu", path_, removed);
  }
}

bool SummaryDirectory::remove(const FileEntry& file) {
  const std::string path = path_ + "/" + file.name;
  const std::error_code error = TWReportingContext::current().platform().files.removeFile(path);
  // Users may remove files, too.
  if (!error || error == std::errc::no_such_file_or_directory) return true;
  if (error.message() != loggedProblem_) {
    errorLog(TWReportingSummaryLogCategory(), "cannot remove %@: %@", path, error.message());
  }
  loggedProblem_ = error.message();
  return false;
}

}  // namespace tonewerk
