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

// Reads and writes the items of diagnostics on the disk, for the store and for tools:
//
//   <state>/captures/01JD.../request.json     and the collected files
//   <state>/issue-drafts/20261120T101800.123Z/...
//   <state>/whirlcaps/...
//
// An item always exists completely or not at all: it is written and removed under a name that begins with a
// dot. No name leads out of an item's directory, and links are not followed. Any thread of any process may
// use it.
class DiagnosticsDirectory {
 public:
  static constexpr std::size_t kMaxNameBytes = 100;

  struct Entry {
    DiagnosticKind kind = DiagnosticKind::kCapture;
    std::string name;
    std::int64_t modifiedNanoseconds = 0;  // since 1970
    std::uint64_t bytes = 0;               // on the disk, in whole blocks
  };

  struct FileEntry {
    std::string name;
    std::uint64_t bytes = 0;
  };

  explicit DiagnosticsDirectory(std::string stateDirectory);

  // Whether the name is safe everywhere: letters, digits, '-', '_', '+' and '.', at most kMaxNameBytes, and
  // not '-' or '.' at the beginning.
  static bool isPlainName(std::string_view name);

  // The space on the disk of an item with these files.
  static std::uint64_t bytesOnDisk(const std::vector<DiagnosticFile>& files);

  std::string pathOf(DiagnosticKind kind, std::string_view name) const;

  // The reason why items cannot be listed. No error if there are no items.
  [[nodiscard]] std::error_code checkReadable(DiagnosticKind kind) const;

  // The items of one kind, oldest first; none if the directory is missing or cannot be read.
  std::vector<Entry> list(DiagnosticKind kind) const;
  // The items of all kinds, oldest first.
  std::vector<Entry> listAll() const;
  bool contains(DiagnosticKind kind, std::string_view name) const;

  // The item's files, sorted by name.
  std::vector<FileEntry> filesOf(DiagnosticKind kind, std::string_view name) const;
  // None if a name is not plain or the file cannot be read.
  [[nodiscard]] std::optional<std::string> readFile(DiagnosticKind kind, std::string_view item,
                                                    std::string_view file) const;

  // Writes an item. When it returns without an error, the item is on the disk; after an error, nothing is
  // left. Fails with std::errc::invalid_argument if a name is not plain, and with std::errc::file_exists if
  // the item exists.
  [[nodiscard]] std::error_code write(DiagnosticKind kind, const std::string& name,
                                      const std::vector<DiagnosticFile>& files) const;

  // Fails with std::errc::no_such_file_or_directory if the item does not exist.
  [[nodiscard]] std::error_code remove(DiagnosticKind kind, const std::string& name) const;

  // Removes incomplete items that a crash left behind, and returns their number. No process may write
  // meanwhile.
  std::size_t sweep() const;

 private:
  std::string directoryOf(DiagnosticKind kind) const;

  const std::string stateDirectory_;
};

}  // namespace tonewerk
