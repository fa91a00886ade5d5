// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/TextFile.h"

#include <cerrno>
#include <unistd.h>
#include <utility>

#include "platform/linux/files/RegularFile.h"
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
  RegularFile file;
  struct stat found {};
  if (const std::error_code error = file.open(path, found)) return error;
  if (status != nullptr) *status = found;
  return file.read(static_cast<std::size_t>(found.st_size), kMaxBytes, bytes);
}

}  // namespace tonewerk
