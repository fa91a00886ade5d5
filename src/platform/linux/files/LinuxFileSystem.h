// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <set>
#include <string>
#include <system_error>
#include <vector>

#include "platform/FileSystem.h"
#include "values/Mutex.h"

namespace tonewerk {

// Reads and writes the kernel's files. Errors are those of the system calls. A name that is not a plain file
// name fails with std::errc::invalid_argument.
//
// Text is written in blocks of 256 KiB. A write() may therefore fail for text of earlier calls, all further
// ones then fail like it, and place() may be the first to notice.
//
// A new file is first written in its directory under a hidden name: ".new-" and a number. It is locked, and
// the kernel releases the lock when the process dies. The first new file in a directory removes leftovers of
// killed processes: files with such a name that belong to this user and are not locked. So several processes
// may write to one directory. On a file system without locks, leftovers stay.
class LinuxFileSystem final : public FileSystem {
 public:
  // When the process is root, each new directory gets the owner of the directory that contains it.
  [[nodiscard]] std::error_code createDirectories(const std::string& path, unsigned mode) override;
  // The file has the mode 0644.
  [[nodiscard]] std::unique_ptr<NewFile> createFile(const std::string& directory, const std::string& name,
                                                    std::error_code& error) override;
  bool exists(const std::string& path) const override;
  [[nodiscard]] std::error_code readFile(const std::string& path, std::string& text) const override;
  // Between file systems the file is copied. The copy is visible while it grows; it is removed if copying
  // fails.
  [[nodiscard]] std::error_code moveFile(const std::string& from, const std::string& directory,
                                         const std::string& name) override;
  [[nodiscard]] std::vector<FileEntry> listFiles(const std::string& directory,
                                                 std::error_code& error) const override;
  [[nodiscard]] std::error_code removeFile(const std::string& path) override;
  // Does nothing when this object has done it before.
  void removeLeftovers(const std::string& directory) override;

 private:
  // Does nothing when the directory was cleaned before.
  void removeLeftovers(const std::string& path, int directory);

  Mutex mutex_;
  std::set<std::string> swept_ GUARDED_BY(mutex_);  // paths of directories
};

}  // namespace tonewerk
