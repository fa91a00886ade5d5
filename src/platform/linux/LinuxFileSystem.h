// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/FileSystem.h"

namespace tonewerk {

// The kernel's files. Errors are those of the system calls; a name that is no plain name is
// std::errc::invalid_argument, something else than a regular file in the new one's place
// std::errc::operation_not_permitted (a symbolic link: std::errc::too_many_symbolic_link_levels).
class LinuxFileSystem final : public FileSystem {
 public:
  std::error_code createDirectories(const std::string& path, unsigned mode) override;
  // The file is readable by everybody whom the directory lets in, writable by its owner (0644).
  std::unique_ptr<WritableFile> createFile(const std::string& directory, const std::string& name,
                                           std::error_code& error) override;
  bool exists(const std::string& path) const override;
  std::error_code readFile(const std::string& path, std::string& text) const override;
  // A copy is there to be seen while it grows; one that fails is removed.
  std::error_code moveFile(const std::string& from, const std::string& directory,
                           const std::string& name) override;
};

}  // namespace tonewerk
