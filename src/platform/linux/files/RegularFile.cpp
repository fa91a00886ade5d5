// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/RegularFile.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

#include "platform/linux/files/TextFile.h"

namespace tonewerk {

std::error_code RegularFile::open(const std::string& path, struct stat& status) {
  // Non-blocking, so that a pipe at this path cannot block the caller.
  file_ = FileDescriptor(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  return file_ ? this->status(status) : lastSystemError();
}

std::error_code RegularFile::status(struct stat& status) const {
  if (fstat(file_.get(), &status) != 0) return lastSystemError();
  if (S_ISDIR(status.st_mode)) return std::make_error_code(std::errc::is_a_directory);
  if (!S_ISREG(status.st_mode)) return std::make_error_code(std::errc::invalid_argument);
  return {};
}

std::error_code RegularFile::read(std::size_t expectedBytes, std::size_t maxBytes, std::string& bytes) const {
  constexpr std::size_t kAtOnce = 4096;
  // One byte more than expected shows that the file is larger. Files in /proc report a size of 0.
  bytes.resize(expectedBytes == 0 ? kAtOnce : std::min(expectedBytes, maxBytes) + 1);
  std::size_t size = 0;
  std::error_code error;
  for (;;) {
    const ssize_t count = ::read(file_.get(), bytes.data() + size, bytes.size() - size);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) error = lastSystemError();
    if (count <= 0) break;
    size += static_cast<std::size_t>(count);
    if (size > maxBytes) error = std::make_error_code(std::errc::file_too_large);
    if (error) break;
    if (size == bytes.size()) bytes.resize(size + kAtOnce);
  }
  bytes.resize(size);
  return error;
}

}  // namespace tonewerk
