// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <optional>
#include <string>

#include "platform/linux/log/LogOutput.h"
#include "platform/linux/log/LogThreshold.h"

namespace tonewerk {

// Writes the log as entries of the system's journal. Besides MESSAGE (the line with its prefix) and PRIORITY
// an entry has the fields SYSLOG_IDENTIFIER, TONEWERK_SUBSYSTEM, TONEWERK_CATEGORY and TONEWERK_LEVEL for
// searching:
//
//   journalctl TONEWERK_CATEGORY=twrr
class JournalLog final : public LogOutput {
 public:
  explicit JournalLog(LogThreshold threshold) : threshold_(std::move(threshold)) {}

  // True when `journalStream`, the value of JOURNAL_STREAM ("device:inode"), names the file behind
  // `fileDescriptor`. What is written there then reaches the journal, so entries can be written instead.
  static bool isJournal(std::string_view journalStream, int fileDescriptor);

  bool isEnabled(std::string_view category, LogLevel level) const override {
    return threshold_.isEnabled(category, level);
  }
  std::optional<LogLevel> fixedThreshold(std::string_view category) const override {
    return threshold_.of(category);
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

  // The journal gives the entry the time at which it arrives, which is later than `at` after the journal has
  // hung.
  void writeAt(double /*at*/, std::string_view subsystem, std::string_view category, LogLevel level,
               std::string_view message) override {
    write(subsystem, category, level, message);
  }

  // The fields of an entry, each as "NAME=value".
  static std::array<std::string, 6> fields(std::string_view subsystem, std::string_view category,
                                           LogLevel level, std::string_view message);

 private:
  const LogThreshold threshold_;
};

}  // namespace tonewerk
