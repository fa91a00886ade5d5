// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// The files of named notifications: one a name in one directory, holding its 64-bit state in decimal. A file
// that is closed after writing, renamed or linked into place is a post.
//
// Names as NotificationService has them; others are refused with std::errc::invalid_argument. Nothing outside
// the directory is ever read or written: links in place of files are not followed. Any thread, any process.
class NotificationFiles {
 public:
  // Spaces around the number included.
  static constexpr std::size_t kMaxStateBytes = 64;

  explicit NotificationFiles(std::string directory) : directory_(std::move(directory)) {}

  const std::string& directory() const { return directory_; }

  // The name's state. Fails with std::errc::no_such_file_or_directory where there is no file, with
  // std::errc::result_out_of_range for one that holds no number of 64 bits, or too much, and with
  // std::errc::invalid_argument for what is no regular file.
  [[nodiscard]] std::optional<std::uint64_t> state(std::string_view name, std::error_code& error) const;

  // Posts the name with the state it has, whatever its file holds; a name without a file gets the state 0.
  // These two make the directory where it is missing. What root makes belongs to whom the directory around it
  // belongs to.
  [[nodiscard]] std::error_code post(std::string_view name) const;
  // Posts the name with a new state. Readers see the old file or the new one.
  [[nodiscard]] std::error_code post(std::string_view name, std::uint64_t state) const;

 private:
  std::string pathOf(std::string_view name) const;
  // Writes a file of its own name, and then lets `place` give it the right one.
  template <typename Place>
  [[nodiscard]] std::error_code put(std::uint64_t state, Place place) const;

  const std::string directory_;
};

}  // namespace tonewerk
