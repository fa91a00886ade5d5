// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <sys/stat.h>
#include <system_error>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Reads a regular file. Files under /proc and /sys are regular files, too.
class RegularFile {
 public:
  // Opens the file and reads its `status`. Never blocks, even if there is a pipe at `path`. Fails with
  // std::errc::is_a_directory for a directory, with invalid_argument for anything else that is not a regular
  // file, or with the system's error.
  [[nodiscard]] std::error_code open(const std::string& path, struct stat& status);
  // Reads the open file's current status. Fails as open() does.
  [[nodiscard]] std::error_code status(struct stat& status) const;
  // Reads the file up to its end; call it once. Fails with std::errc::file_too_large if there are more than
  // `maxBytes` bytes, or with the system's error; `bytes` then holds what was read until then. The first call
  // of the system asks for `expectedBytes`; a wrong number only costs more calls.
  [[nodiscard]] std::error_code read(std::size_t expectedBytes, std::size_t maxBytes,
                                     std::string& bytes) const;

 private:
  FileDescriptor file_;
};

}  // namespace tonewerk
