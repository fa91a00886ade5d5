// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/WholeFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

std::error_code statusOf(const FileDescriptor& file, struct stat& status) {
  if (fstat(file.get(), &status) != 0) return lastSystemError();
  if (S_ISDIR(status.st_mode)) return std::make_error_code(std::errc::is_a_directory);
  if (!S_ISREG(status.st_mode)) return std::make_error_code(std::errc::invalid_argument);
  return {};
}

// Up to `most` bytes, in as few calls as it takes.
std::error_code readUpTo(const FileDescriptor& file, std::size_t most, std::string& text) {
  text.resize(most);
  std::size_t size = 0;
  while (size < most) {
    const ssize_t count = read(file.get(), text.data() + size, most - size);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return lastSystemError();
    if (count == 0) break;
    size += static_cast<std::size_t>(count);
  }
  text.resize(size);
  return {};
}

// A new name, or none, changes a file's time of status, not its contents.
bool isSameContent(const FileStamp& a, const FileStamp& b) {
  return a.size == b.size && a.modifiedNanoseconds == b.modifiedNanoseconds;
}

}  // namespace

std::error_code readWholeFile(const std::string& path, std::size_t mostBytes, std::string& text,
                              FileStamp& stamp) {
  for (int attempt = 0; attempt < kMaxAttempts; ++attempt) {
    text.clear();
    const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
    if (!file) return lastSystemError();
    struct stat status {};
    if (const std::error_code error = statusOf(file, status)) return error;
    stamp = FileStamp::of(status);
    const auto size = static_cast<std::size_t>(status.st_size);
    if (size > mostBytes) return std::make_error_code(std::errc::file_too_large);
    // One byte more than there should be, which shows a file that grew.
    if (const std::error_code error = readUpTo(file, size + 1, text)) return error;
    if (const std::error_code error = statusOf(file, status)) return error;
    if (text.size() == size && isSameContent(stamp, FileStamp::of(status))) return {};
  }
  return std::make_error_code(std::errc::resource_unavailable_try_again);
}

}  // namespace tonewerk
