// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <set>
#include <string>

#include "platform/FileSystem.h"
#include "values/Mutex.h"

namespace tonewerk {

// The kernel's files. Errors are those of the system calls; a name that is no plain name is
// std::errc::invalid_argument.
//
// A new file is written beside its place under a hidden name, ".new-" and a number, with a lock on it that
// its process's death ends. The first one in a directory removes what lies there under such names, is this
// user's and has no lock: what processes left that were killed. So other processes may write there, too. A
// file system without locks keeps what they left.
class LinuxFileSystem final : public FileSystem {
 public:
  // What root makes belongs to whom the directory around it belongs to.
  [[nodiscard]] std::error_code createDirectories(const std::string& path, unsigned mode) override;
  // The file is readable by everybody whom the directory lets in, writable by its owner (0644).
  [[nodiscard]] std::unique_ptr<NewFile> createFile(const std::string& directory, const std::string& name,
                                                    std::error_code& error) override;
  bool exists(const std::string& path) const override;
  [[nodiscard]] std::error_code readFile(const std::string& path, std::string& text) const override;
  // A copy is there to be seen while it grows; one that fails is removed.
  [[nodiscard]] std::error_code moveFile(const std::string& from, const std::string& directory,
                                         const std::string& name) override;

 private:
  // Once a directory.
  void removeLeftovers(const std::string& path, int directory);

  Mutex mutex_;
  std::set<std::string> swept_ GUARDED_BY(mutex_);  // the directories, by path
};

}  // namespace tonewerk
