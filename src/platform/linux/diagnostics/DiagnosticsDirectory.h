// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/linux/diagnostics/collectors/DiagnosticItem.h"

namespace tonewerk {

// The items on the disk, as the store that writes them and the tools that read them see them:
//
//   <state>/captures/01JD.../request.json     and what was collected
//   <state>/issue-drafts/20261120T101800.123Z/...
//   <state>/whirlcaps/...
//
// An item is there whole or not at all: it is made, and taken apart, under a name that begins with a dot. No
// name leads out of an item's directory, and links are not followed. Any thread, any process.
class DiagnosticsDirectory {
 public:
  static constexpr std::size_t kMaxNameBytes = 100;

  struct Entry {
    DiagnosticKind kind = DiagnosticKind::kCapture;
    std::string name;
    std::int64_t modifiedNanoseconds = 0;  // since 1970
    std::uint64_t bytes = 0;               // of disk, in whole blocks
  };

  struct FileEntry {
    std::string name;
    std::uint64_t bytes = 0;
  };

  explicit DiagnosticsDirectory(std::string stateDirectory);

  // Letters, digits, '-', '_', '+' and '.', at most kMaxNameBytes, not beginning with '-' or '.': a name that
  // needs no care anywhere.
  static bool isPlainName(std::string_view name);

  // What the files take on the disk as one item.
  static std::uint64_t bytesOnDisk(const std::vector<DiagnosticFile>& files);

  std::string pathOf(DiagnosticKind kind, std::string_view name) const;

  // Why items cannot be listed; no error where there are none.
  [[nodiscard]] std::error_code checkReadable(DiagnosticKind kind) const;

  // Oldest first; a directory that is missing or cannot be read has none.
  std::vector<Entry> list(DiagnosticKind kind) const;
  // Those of all kinds, oldest first.
  std::vector<Entry> listAll() const;
  bool contains(DiagnosticKind kind, std::string_view name) const;

  // The item's files by name.
  std::vector<FileEntry> filesOf(DiagnosticKind kind, std::string_view name) const;
  // None for a name that is not plain, or a file that cannot be read.
  [[nodiscard]] std::optional<std::string> readFile(DiagnosticKind kind, std::string_view item,
                                                    std::string_view file) const;

  // On the disk when it returns without an error; nothing is left of what failed. std::errc::invalid_argument
  // for names that are not plain, std::errc::file_exists for one that is taken.
  [[nodiscard]] std::error_code write(DiagnosticKind kind, const std::string& name,
                                      const std::vector<DiagnosticFile>& files) const;

  // std::errc::no_such_file_or_directory when it is not there.
  [[nodiscard]] std::error_code remove(DiagnosticKind kind, const std::string& name) const;

  // Removes what a crash left half made or half taken apart. Only while nobody writes. The number of folders.
  std::size_t sweep() const;

 private:
  std::string directoryOf(DiagnosticKind kind) const;

  const std::string stateDirectory_;
};

}  // namespace tonewerk
