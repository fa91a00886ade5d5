// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxFileSystem.h"

#include <cassert>
#include <cerrno>
#include <fcntl.h>
#include <linux/fs.h>
#include <stdio.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/FileDescriptor.h"
#include "platform/linux/TextFile.h"

namespace tonewerk {
namespace {

constexpr mode_t kFileMode = 0644;

bool isPlainName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
         name.find('\0') == std::string_view::npos;
}

bool isDirectory(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

std::error_code createDirectory(const std::string& path, mode_t mode) {
  if (mkdir(path.c_str(), mode) == 0) {
    // The process's mask has taken bits away.
    return chmod(path.c_str(), mode) == 0 ? std::error_code() : lastSystemError();
  }
  const std::error_code error = lastSystemError();
  if (isDirectory(path)) return {};
  return error == std::errc::file_exists ? std::make_error_code(std::errc::not_a_directory) : error;
}

class LinuxFile final : public WritableFile {
 public:
  explicit LinuxFile(int descriptor) : descriptor_(descriptor) {}
  LinuxFile(const LinuxFile&) = delete;
  LinuxFile& operator=(const LinuxFile&) = delete;
  ~LinuxFile() override {
    if (descriptor_ >= 0) ::close(descriptor_);
  }

  std::error_code write(std::string_view text) override {
    while (!text.empty()) {
      const ssize_t written = ::write(descriptor_, text.data(), text.size());
      if (written >= 0) {
        text.remove_prefix(static_cast<std::size_t>(written));
      } else if (errno != EINTR) {
        return lastSystemError();
      }
    }
    return {};
  }

  std::error_code close() override {
    assert(descriptor_ >= 0);
    // An interrupted close() has closed all the same.
    const int result = ::close(std::exchange(descriptor_, -1));
    return result == 0 || errno == EINTR ? std::error_code() : lastSystemError();
  }

 private:
  int descriptor_;
};

// Why what is open under `descriptor` cannot be written as a new file, having emptied it if it can.
std::error_code makeEmpty(int descriptor) {
  struct stat status {};
  if (fstat(descriptor, &status) != 0) return lastSystemError();
  if (!S_ISREG(status.st_mode)) return std::make_error_code(std::errc::operation_not_permitted);
  return ftruncate(descriptor, 0) == 0 ? std::error_code() : lastSystemError();
}

std::error_code copyAll(int from, int to) {
  constexpr std::size_t kPieceBytes = std::size_t{16} << 20;
  for (;;) {
    const ssize_t copied = sendfile(to, from, nullptr, kPieceBytes);
    if (copied == 0) return {};
    if (copied < 0 && errno != EINTR) return lastSystemError();
  }
}

// Copies the file `from` to a new one, and leaves none when that fails.
std::error_code copyFile(const std::string& from, int directory, const std::string& name) {
  const FileDescriptor source(open(from.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (!source) return lastSystemError();
  const int descriptor =
      openat(directory, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kFileMode);
  if (descriptor < 0) return lastSystemError();
  LinuxFile copy(descriptor);
  std::error_code error = copyAll(source.get(), descriptor);
  if (!error) error = copy.close();
  if (error) static_cast<void>(unlinkat(directory, name.c_str(), 0));
  return error;
}

std::error_code copyAndRemove(const std::string& from, int directory, const std::string& name) {
  if (const std::error_code error = copyFile(from, directory, name)) return error;
  if (unlink(from.c_str()) == 0) return {};
  const std::error_code error = lastSystemError();
  static_cast<void>(unlinkat(directory, name.c_str(), 0));
  return error;
}

}  // namespace

std::error_code LinuxFileSystem::createDirectories(const std::string& path, unsigned mode) {
  if (path.find('\0') != std::string::npos) return std::make_error_code(std::errc::invalid_argument);
  if (isDirectory(path)) return {};
  for (std::size_t slash = path.find('/', 1);; slash = path.find('/', slash + 1)) {
    if (const std::error_code error = createDirectory(path.substr(0, slash), static_cast<mode_t>(mode))) {
      return error;
    }
    if (slash == std::string::npos) return {};
  }
}

std::unique_ptr<WritableFile> LinuxFileSystem::createFile(const std::string& directory,
                                                          const std::string& name, std::error_code& error) {
  error.clear();
  if (!isPlainName(name)) {
    error = std::make_error_code(std::errc::invalid_argument);
    return nullptr;
  }
  const FileDescriptor parent(open(directory.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!parent) {
    error = lastSystemError();
    return nullptr;
  }
  // Emptied only once it is known to be a regular file. Non-blocking, so that a pipe in its place cannot hold
  // us.
  constexpr int kFlags = O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
  const int descriptor = openat(parent.get(), name.c_str(), kFlags, kFileMode);
  if (descriptor < 0) {
    error = lastSystemError();
    return nullptr;
  }
  auto file = std::make_unique<LinuxFile>(descriptor);
  error = makeEmpty(descriptor);
  if (error) return nullptr;
  return file;
}

bool LinuxFileSystem::exists(const std::string& path) const {
  struct stat status {};
  return path.find('\0') == std::string::npos && stat(path.c_str(), &status) == 0;
}

std::error_code LinuxFileSystem::readFile(const std::string& path, std::string& text) const {
  if (path.find('\0') != std::string::npos) return std::make_error_code(std::errc::invalid_argument);
  return readTextFile(path, text);
}

std::error_code LinuxFileSystem::moveFile(const std::string& from, const std::string& directory,
                                          const std::string& name) {
  if (!isPlainName(name)) return std::make_error_code(std::errc::invalid_argument);
  struct stat status {};
  if (lstat(from.c_str(), &status) != 0) return lastSystemError();
  if (!S_ISREG(status.st_mode)) return std::make_error_code(std::errc::operation_not_permitted);
  const FileDescriptor parent(open(directory.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!parent) return lastSystemError();
  if (renameat2(AT_FDCWD, from.c_str(), parent.get(), name.c_str(), RENAME_NOREPLACE) == 0) return {};
  const std::error_code error = lastSystemError();
  // The second is a file system that cannot rename without replacing.
  const bool needsCopy = error == std::errc::cross_device_link || error == std::errc::invalid_argument;
  return needsCopy ? copyAndRemove(from, parent.get(), name) : error;
}

}  // namespace tonewerk
