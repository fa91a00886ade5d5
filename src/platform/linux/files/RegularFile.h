// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <sys/stat.h>
#include <system_error>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// A regular file that is open for reading; those under /proc and /sys are such files, too.
class RegularFile {
 public:
  // Never waits, whatever stands in the file's place. `status` is what the file is. Fails with
  // std::errc::is_a_directory or invalid_argument for what is no regular file, or with the system's error.
  [[nodiscard]] std::error_code open(const std::string& path, struct stat& status);
  // What the open file is now.
  [[nodiscard]] std::error_code status(struct stat& status) const;
  // The file's bytes up to its end, to be called once. Fails with std::errc::file_too_large when there are
  // more than `mostBytes`, or with the system's error; `bytes` holds what came until then. `expectedBytes`
  // are asked for at once; a wrong number costs calls, not bytes.
  [[nodiscard]] std::error_code read(std::size_t expectedBytes, std::size_t mostBytes,
                                     std::string& bytes) const;

 private:
  FileDescriptor file_;
};

}  // namespace tonewerk
