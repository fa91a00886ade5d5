// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <optional>
#include <string>

#include "platform/Log.h"
#include "platform/linux/log/LogThreshold.h"

namespace tonewerk {

// The log as entries of the system's journal. Besides MESSAGE (the line with its prefix) and PRIORITY an
// entry has SYSLOG_IDENTIFIER, TONEWERK_SUBSYSTEM, TONEWERK_CATEGORY and TONEWERK_LEVEL, to search by:
//
//   journalctl TONEWERK_CATEGORY=twrr
class JournalLog final : public Log {
 public:
  explicit JournalLog(LogThreshold threshold) : threshold_(std::move(threshold)) {}

  // Whether `journalStream`, the value of JOURNAL_STREAM ("device:inode"), names what `fileDescriptor` is
  // open on: then that is the journal, and whoever writes there may as well write entries.
  static bool isJournal(std::string_view journalStream, int fileDescriptor);

  bool isEnabled(std::string_view category, LogLevel level) const override {
    return threshold_.isEnabled(category, level);
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

  // An entry's fields, "NAME=value" each.
  static std::array<std::string, 6> fields(std::string_view subsystem, std::string_view category,
                                           LogLevel level, std::string_view message);

 private:
  const LogThreshold threshold_;
};

}  // namespace tonewerk
