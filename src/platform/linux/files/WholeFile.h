// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <system_error>

#include "platform/linux/files/FileStamp.h"

namespace tonewerk {

// Reads a regular file that others may replace or write to meanwhile: from one descriptor, so that a file
// that is replaced is the old or the new one, and again while its size or its time of change moves under the
// reader's hands. Without such a trace, as when both writes fall into one tick of the file system's clock, a
// file written in place may still come in two halves.
//
// Never waits, whatever stands in the file's place. `text` and `stamp` are of what was read. Fails with
//   std::errc::file_too_large               over `mostBytes`
//   std::errc::resource_unavailable_try_again  it moved each of kMaxAttempts times
//   std::errc::invalid_argument, is_a_directory  no regular file
// or the system's error.
inline constexpr int kMaxAttempts = 3;
[[nodiscard]] std::error_code readWholeFile(const std::string& path, std::size_t mostBytes, std::string& text,
                                            FileStamp& stamp);

}  // namespace tonewerk
