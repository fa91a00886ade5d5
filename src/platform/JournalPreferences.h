// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <string>

namespace tonewerk {

class PreferenceStore;

// What people decide about the journal of requests: the preferences "journal_megabytes",
// "journal_sync_seconds" and "journal_days" of the domain "com.orvane.tonewerk.store".
struct JournalPreferences {
  std::uint64_t bytes = 0;  // the most that the journal takes
  std::chrono::nanoseconds syncInterval{0};
  std::chrono::seconds keepsDropped{0};  // how long segments are kept that no recovery needs
};

// A wrong value counts as the default; `problems` then says in words which, else it becomes empty.
JournalPreferences readJournalPreferences(const PreferenceStore& preferences, std::string& problems);

}  // namespace tonewerk
