// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Reads and writes the files of named notifications. One directory holds one file for each name, with the
// name's 64-bit state in decimal. A post is a file that is closed after writing, or renamed or linked into
// place.
//
// The names are those that NotificationService accepts; others fail with std::errc::invalid_argument. Nothing
// outside the directory is read or written, because symbolic links are not followed. Any thread of any
// process may use the files.
class NotificationFiles {
 public:
  // Includes spaces around the number.
  static constexpr std::size_t kMaxStateBytes = 64;

  explicit NotificationFiles(std::string directory) : directory_(std::move(directory)) {}

  const std::string& directory() const { return directory_; }

  // The name's state. Fails with std::errc::no_such_file_or_directory if there is no file, with
  // std::errc::result_out_of_range if it does not hold a 64-bit number or is longer than kMaxStateBytes, and
  // with std::errc::invalid_argument if it is not a regular file.
  [[nodiscard]] std::optional<std::uint64_t> state(std::string_view name, std::error_code& error) const;

  // Posts the name and keeps its state; the contents of its file do not matter. A name without a file gets
  // the state 0. Both post() functions create a missing directory. When the process is root, everything they
  // create gets the owner of the directory that contains it.
  //
  // A directory with the sticky bit keeps a name for the user who posted it first: both functions then fail
  // for others, with std::errc::permission_denied or operation_not_permitted. But for the directory's owner
  // they replace the file by one of its own, whatever it is, unless it is a directory. The first function
  // then keeps the state that it can read, or else sets 0.
  [[nodiscard]] std::error_code post(std::string_view name) const;
  // Posts the name with a new state. Readers see either the old file or the new one.
  [[nodiscard]] std::error_code post(std::string_view name, std::uint64_t state) const;

 private:
  std::string pathOf(std::string_view name) const;
  // Posts a name whose file belongs to another user.
  [[nodiscard]] std::error_code takeOver(std::string_view name) const;
  // Writes a file with a temporary name and then calls `place` to give it its final name.
  template <typename Place>
  [[nodiscard]] std::error_code put(std::uint64_t state, Place place) const;

  const std::string directory_;
};

}  // namespace tonewerk
