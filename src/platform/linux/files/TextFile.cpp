// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/TextFile.h"

#include <array>
#include <cerrno>
#include <fcntl.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMaxBytes = std::size_t{16} << 20;

}  // namespace

std::error_code lastSystemError() { return {errno, std::generic_category()}; }

std::error_code writeAll(int descriptor, std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = write(descriptor, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
}

std::error_code readTextFile(const std::string& path, std::string& text) {
  const std::error_code error = readFileBytes(path, text);
  text = validUtf8(std::move(text));
  return error;
}

std::error_code readFileBytes(const std::string& path, std::string& bytes, struct stat* status) {
  bytes.clear();
  // Non-blocking, so that a pipe in the file's place cannot hold the caller.
  const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file) return lastSystemError();
  struct stat found {};
  if (fstat(file.get(), &found) != 0) return lastSystemError();
  if (S_ISDIR(found.st_mode)) return std::make_error_code(std::errc::is_a_directory);
  if (!S_ISREG(found.st_mode)) return std::make_error_code(std::errc::invalid_argument);
  if (status != nullptr) *status = found;

  std::array<char, 4096> buffer;
  for (;;) {
    const ssize_t count = read(file.get(), buffer.data(), buffer.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return lastSystemError();
    if (count == 0) return {};
    bytes.append(buffer.data(), static_cast<std::size_t>(count));
    if (bytes.size() > kMaxBytes) return std::make_error_code(std::errc::file_too_large);
  }
}

}  // namespace tonewerk
