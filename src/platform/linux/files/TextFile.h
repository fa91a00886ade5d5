// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <sys/stat.h>
#include <system_error>

namespace tonewerk {

// Reads a whole regular file (files under /proc and /sys included). Fails with std::errc::file_too_large if
// it has more than 16 MiB. If `status` is not null, it is set to the file's status before reading.
[[nodiscard]] std::error_code readFileBytes(const std::string& path, std::string& bytes,
                                            struct stat* status = nullptr);

// Like readFileBytes(), but replaces bytes that are not UTF-8 by U+FFFD. The kernel cuts names of processes
// and sound cards at a number of bytes, which may be within a character.
[[nodiscard]] std::error_code readTextFile(const std::string& path, std::string& text);

// Writes all of `text` to a blocking descriptor, in as many calls as necessary.
[[nodiscard]] std::error_code writeAll(int descriptor, std::string_view text);

// The error of this thread's last failed system call (errno).
std::error_code lastSystemError();

}  // namespace tonewerk
