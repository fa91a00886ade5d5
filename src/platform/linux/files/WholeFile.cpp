// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/WholeFile.h"

#include <sys/stat.h>

#include "platform/linux/files/RegularFile.h"

namespace tonewerk {
namespace {

// Compares no status-change time: adding or removing a name changes that time, but not the contents.
bool isSameContent(const FileStamp& a, const FileStamp& b) {
  return a.size == b.size && a.modifiedNanoseconds == b.modifiedNanoseconds;
}

}  // namespace

std::error_code readWholeFile(const std::string& path, std::size_t maxBytes, std::string& text,
                              FileStamp& stamp) {
  for (int attempt = 0; attempt < kMaxAttempts; ++attempt) {
    text.clear();
    RegularFile file;
    struct stat status {};
    if (const std::error_code error = file.open(path, status)) return error;
    stamp = FileStamp::of(status);
    const auto size = static_cast<std::size_t>(status.st_size);
    if (size > maxBytes) return std::make_error_code(std::errc::file_too_large);
    const std::error_code error = file.read(size, size, text);
    if (error == std::errc::file_too_large) continue;  // it grew
    if (error) return error;
    if (const std::error_code failure = file.status(status)) return failure;
    if (text.size() == size && isSameContent(stamp, FileStamp::of(status))) return {};
  }
  return std::make_error_code(std::errc::resource_unavailable_try_again);
}

}  // namespace tonewerk
