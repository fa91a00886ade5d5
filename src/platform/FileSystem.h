// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <system_error>

namespace tonewerk {

// A file that is being written. It is to be seen under a name once it is whole: until place() it has none
// that others know, and one that is destroyed before leaves nothing behind.
class NewFile {
 public:
  virtual ~NewFile() = default;

  // All of `text`, or an error. After one the file can be written to, but is never whole.
  [[nodiscard]] virtual std::error_code write(std::string_view text) = 0;

  // Ends the writing: the file stands under `name` in its directory, and name and text are on the disk.
  // Once, but again after std::errc::file_exists (something stands there, which stays as it is). Other
  // failures: the first one of a write(), a name that createFile() would refuse, what the operating system
  // only finds out at the end; where that is that the name cannot be brought to the disk, the whole file
  // stands there all the same.
  [[nodiscard]] virtual std::error_code place(const std::string& name) = 0;
};

// Any thread.
class FileSystem {
 public:
  virtual ~FileSystem() = default;

  // The directory and what is missing above it. `mode` (as 0777) is what a directory made here gets, whatever
  // the process's file mode mask. No error when it exists.
  [[nodiscard]] virtual std::error_code createDirectories(const std::string& path, unsigned mode) = 0;

  // A new file that is to be `name` in `directory`. Fails when it would not lie directly in `directory` (a
  // name with a slash or a zero byte, ".", ".."), when the name is too long, and with std::errc::file_exists
  // when something stands there (a symbolic link, too).
  [[nodiscard]] virtual std::unique_ptr<NewFile> createFile(const std::string& directory,
                                                            const std::string& name,
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
