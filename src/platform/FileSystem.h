// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// A file open for writing. Closed by its destructor when close() was not called.
class WritableFile {
 public:
  virtual ~WritableFile() = default;

  // All of `text`, or an error.
  [[nodiscard]] virtual std::error_code write(std::string_view text) = 0;

  // Once. Reports what the operating system only finds out at the end.
  [[nodiscard]] virtual std::error_code close() = 0;
};

// Any thread.
class FileSystem {
 public:
  virtual ~FileSystem() = default;

  // The directory and what is missing above it. `mode` (as 0777) is what a directory made here gets, whatever
  // the process's file mode mask. No error when it exists.
  [[nodiscard]] virtual std::error_code createDirectories(const std::string& path, unsigned mode) = 0;

  // Creates `name` in `directory`, or empties it, and opens it. Fails when the file would not lie directly in
  // `directory` (a name with a slash or a zero byte, ".", "..", a symbolic link that stands there).
  virtual std::unique_ptr<WritableFile> createFile(const std::string& directory, const std::string& name,
                                                   std::error_code& error) = 0;

  // Whether something stands there; a symbolic link counts as what it leads to.
  virtual bool exists(const std::string& path) const = 0;

  // A regular file's whole text, of at most 16 MiB (else std::errc::file_too_large).
  [[nodiscard]] virtual std::error_code readFile(const std::string& path, std::string& text) const = 0;

  // Moves a regular file to `name` in `directory`, also onto another file system, where it is copied. Fails,
  // and leaves everything as it was, when something stands there (std::errc::file_exists) or when the file
  // would not lie directly in `directory` (as createFile()).
  [[nodiscard]] virtual std::error_code moveFile(const std::string& from, const std::string& directory,
                                                 const std::string& name) = 0;
};

}  // namespace tonewerk
