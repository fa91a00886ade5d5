// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <system_error>

#include "platform/linux/files/FileStamp.h"

namespace tonewerk {

// Reads a whole regular file that other processes may replace or write to at the same time. It reads through
// one descriptor, so a file that is being replaced is read as the old one or the new one. If the file's size
// or modification time changes while it is read, it is read again. A write that changes neither (because two
// writes fall into one tick of the file system's clock) is not noticed: then `text` may mix two states of a
// file that is written in place.
//
// Never blocks, even if there is a pipe at `path`. `text` and `stamp` describe the file that was read. Fails
// with
//   std::errc::file_too_large                       the file has more than `maxBytes` bytes
//   std::errc::resource_unavailable_try_again       it changed at each of kMaxAttempts attempts
//   std::errc::invalid_argument, is_a_directory     it is not a regular file
// or with the system's error.
inline constexpr int kMaxAttempts = 3;
[[nodiscard]] std::error_code readWholeFile(const std::string& path, std::size_t maxBytes, std::string& text,
                                            FileStamp& stamp);

}  // namespace tonewerk
