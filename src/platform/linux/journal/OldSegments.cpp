// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/OldSegments.h"

#include <algorithm>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/journal/SegmentNames.h"

namespace tonewerk {
void OldSegments::add(const JournalDirectory::Entry& entry) {
  const auto after = std::upper_bound(
      kept_.begin(), kept_.end(), entry,
      [](const JournalDirectory::Entry& a, const JournalDirectory::Entry& b) { return a.name < b.name; });
  kept_.insert(after, entry);
  bytes_ += entry.bytes;
}

void OldSegments::clear() {
  kept_.clear();
  bytes_ = 0;
}

std::error_code OldSegments::take(const std::string& file, std::uint64_t bytes, double newestAt) {
  if (preferences().keepsDropped.count() == 0) return directory_.remove(file);
  const JournalDirectory::Entry entry{oldSegmentNameOf(file), bytes, newestAt};
  if (const std::error_code error = directory_.rename(file, entry.name, newestAt)) return error;
  add(entry);
  return {};
}

void OldSegments::trim(std::uint64_t otherBytes, double now) {
  if (kept_.empty()) return;
  const JournalPreferences wanted = preferences();
  const auto longest = static_cast<double>(wanted.keepsDropped.count());
  while (!kept_.empty()) {
    const JournalDirectory::Entry& oldest = kept_.front();
    const bool isTooOld = longest == 0.0 || now - oldest.changedAt > longest;
    if (!isTooOld && bytes_ + otherBytes <= wanted.bytes) return;
    const std::error_code error = directory_.remove(oldest.name);
    if (error && error != std::errc::no_such_file_or_directory) {
      errorLog(log_, "cannot remove %s/%s: %s", directory_.path(), oldest.name, error.message());
    }
    // One that cannot be removed is tried again by the next process.
    bytes_ -= oldest.bytes;
    kept_.pop_front();
  }
}

// A wrong value is logged once.
JournalPreferences OldSegments::preferences() {
  std::string problems;
  const JournalPreferences read = readJournalPreferences(preferences_, problems);
  if (std::exchange(loggedProblems_, problems) != problems && !problems.empty()) {
    errorLog(log_, "%s; the default is used", problems);
  }
  return read;
}

}  // namespace tonewerk
