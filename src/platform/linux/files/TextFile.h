// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <sys/stat.h>
#include <system_error>

namespace tonewerk {

// Reads a whole file, at most 16 MiB of it (else std::errc::file_too_large). `status`, when it is not null,
// is what the file was while it was read. Only regular files, which those under /proc and /sys are, too.
[[nodiscard]] std::error_code readFileBytes(const std::string& path, std::string& bytes,
                                            struct stat* status = nullptr);

// The same of a file that somebody or something just filled with words: what is no UTF-8 in it reads as
// U+FFFD. A process cut its name to 15 bytes, a card its own to as many as fit.
[[nodiscard]] std::error_code readTextFile(const std::string& path, std::string& text);

// All of `text`, in as many calls as it takes, into a descriptor that waits.
[[nodiscard]] std::error_code writeAll(int descriptor, std::string_view text);

// The error that the last failed system call of this thread left behind.
std::error_code lastSystemError();

}  // namespace tonewerk
