// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

namespace tonewerk {

// Writes a new file that gets its name only when it is complete. Until place() no other program can see the
// file; destroying it before leaves nothing behind.
class NewFile {
 public:
  virtual ~NewFile() = default;

  // Appends `text`, which may be written only later, with other texts. A failure therefore may concern
  // earlier texts. It is final: the file cannot be placed any more, and each later write() fails with the
  // same error (an implementation for tests may let it succeed).
  [[nodiscard]] virtual std::error_code write(std::string_view text) = 0;

  // Ends the writing. The file then has `name` in its directory, and name and text are on the disk. Call
  // once; call again only after std::errc::file_exists, which means that something has this name and stays
  // unchanged. Other failures are the first failure of write(), a name that createFile() would refuse, and
  // errors with texts that were not written yet or that the operating system reports only at the end. Where
  // such an error is that the name could not be brought to the disk, the complete file is nevertheless
  // there.
  [[nodiscard]] virtual std::error_code place(const std::string& name) = 0;
};

// A regular file of a directory.
struct FileEntry {
  std::string name;
  std::uint64_t bytes = 0;
  double modifiedAt = 0.0;  // in seconds since 1970
};

// Reads, makes, moves and removes files and directories. Any thread.
class FileSystem {
 public:
  virtual ~FileSystem() = default;

  // Makes the directory and its missing parents. Each directory that it makes gets `mode` (such as 0777),
  // whatever the process's file mode mask. Succeeds when the directory exists.
  [[nodiscard]] virtual std::error_code createDirectories(const std::string& path, unsigned mode) = 0;

  // Begins a new file that place() can name `name` in `directory`. Fails when the file would not be directly
  // in `directory` (a name with a slash or a zero byte, ".", ".."), when the name is too long, and with
  // std::errc::file_exists when something has the name, even a symbolic link.
  [[nodiscard]] virtual std::unique_ptr<NewFile> createFile(const std::string& directory,
                                                            const std::string& name,
                                                            std::error_code& error) = 0;

  // Returns whether `path` exists. A symbolic link counts as its target.
  virtual bool exists(const std::string& path) const = 0;

  // Reads the whole text of a regular file of at most 16 MiB; a larger one is std::errc::file_too_large.
  [[nodiscard]] virtual std::error_code readFile(const std::string& path, std::string& text) const = 0;

  // Moves a regular file to `name` in `directory`. On another file system it copies the file. Fails and
  // changes nothing when something has the name (std::errc::file_exists) or when the file would not be
  // directly in `directory` (see createFile()).
  [[nodiscard]] virtual std::error_code moveFile(const std::string& from, const std::string& directory,
                                                 const std::string& name) = 0;

  // The regular files directly in `directory`, in no order. Files that are being written are none. What was
  // read before an error is returned with it.
  [[nodiscard]] virtual std::vector<FileEntry> listFiles(const std::string& directory,
                                                         std::error_code& error) const = 0;

  // Removes a regular file or a symbolic link.
  [[nodiscard]] virtual std::error_code removeFile(const std::string& path) = 0;

  // Removes what processes that were killed left in `directory` of their new files. Not necessary before
  // createFile().
  virtual void removeLeftovers(const std::string& directory) = 0;
};

}  // namespace tonewerk
