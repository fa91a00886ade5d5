// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/Journal.h"
#include "platform/linux/journal/JournalDirectory.h"
#include "values/FunctionRef.h"

namespace tonewerk {

// Reads a journal that a daemon may be using: all records that are in the directory, also those that no
// recovery needs any more. It changes nothing.
//
//   LinuxJournalDirectory directory(path);
//   if (const auto error = directory.openToRead()) ...
//   JournalReader reader(directory);
//   reader.read([](const Journal::Record& record, bool isFirstOfProcess) { ...; return true; });
//
// A segment that the daemon renames meanwhile is read under its new name. One that it removes is left out,
// and so is what it writes after the call has begun. One object reads once, on one thread.
class JournalReader {
 public:
  // `isFirstOfProcess`: another process has written the records before. Its clients are gone.
  using Visit = FunctionRef<bool(const Journal::Record& record, bool isFirstOfProcess)>;

  // `directory` is open, and outlives the object.
  explicit JournalReader(const JournalDirectory& directory) : directory_(directory) {}

  // Calls visit() for each record from the oldest one on, until it returns false. Fails only when the
  // directory cannot be listed.
  [[nodiscard]] std::error_code read(Visit visit);

  // What the call has found.
  const Journal::Reading& reading() const { return reading_; }
  // How many records are missing between those that were read: they are damaged, or were never written.
  std::uint64_t missing() const { return missing_; }
  // The segments that were left out as a whole: "NAME: why".
  const std::vector<std::string>& unread() const { return unread_; }

 private:
  struct Segment {
    std::uint64_t first = 0;
    std::string name;
  };

  [[nodiscard]] std::error_code list(std::vector<Segment>& segments) const;
  // False when nothing can be read of it.
  [[nodiscard]] bool load(const Segment& segment);
  [[nodiscard]] bool readSegment(std::uint64_t first, bool isNewest, Visit visit);

  const JournalDirectory& directory_;
  Journal::Reading reading_;
  std::uint64_t missing_ = 0;
  std::vector<std::string> unread_;
  std::string bytes_;                    // of the segment that is read
  std::uint64_t last_ = 0;               // the last number that is not missing
  std::optional<std::uint32_t> marker_;  // of the last record
  bool isDamaged_ = false;               // there was damage after the last record
};

}  // namespace tonewerk
