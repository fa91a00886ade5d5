// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <deque>
#include <string>
#include <system_error>

#include "platform/JournalPreferences.h"
#include "platform/linux/journal/JournalDirectory.h"

namespace tonewerk {

class LogCategory;
class PreferenceStore;

// Dropped segments that are kept to be replayed, as files that end in .old. The preference "journal_days"
// (0) of the domain "com.orvane.tonewerk.store" says how long, by the time of a segment's newest record;
// they take what the journal leaves of "journal_megabytes" (64). The preferences are read at each use. Not
// thread-safe.
class OldSegments {
 public:
  // All references outlive the object.
  OldSegments(JournalDirectory& directory, const PreferenceStore& preferences, const LogCategory& log)
      : directory_(directory), preferences_(preferences), log_(log) {}

  // Takes one that is in the directory. They may come in any order.
  void add(const JournalDirectory::Entry& entry);
  void clear();

  // Keeps the segment with this file, or removes it.
  [[nodiscard]] std::error_code take(const std::string& file, std::uint64_t bytes, double newestAt);

  // Removes those that are too old at the time `now`, and the oldest ones when there are more than
  // "journal_megabytes" together with `otherBytes`.
  void trim(std::uint64_t otherBytes, double now);

 private:
  JournalPreferences preferences();

  JournalDirectory& directory_;
  const PreferenceStore& preferences_;
  const LogCategory& log_;
  std::deque<JournalDirectory::Entry> kept_;  // the oldest first
  std::uint64_t bytes_ = 0;
  std::string loggedProblems_;
};

}  // namespace tonewerk
