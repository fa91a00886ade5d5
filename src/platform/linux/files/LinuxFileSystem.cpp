// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/LinuxFileSystem.h"

#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <linux/fs.h>
#include <random>
#include <stdio.h>
#include <string_view>
#include <sys/file.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/Ownership.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr mode_t kFileMode = 0644;
constexpr std::string_view kHiddenPrefix = ".new-";
// Writers give short lines; one system call for each costs more than everything else.
constexpr std::size_t kBlockBytes = std::size_t{256} << 10;

bool isPlainName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos &&
         name.find('\0') == std::string_view::npos;
}

bool isDirectory(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// Sets the mode and the owner of the new directory at `path`. mkdir() has removed the bits of the process's
// umask from the mode.
std::error_code finishDirectory(const std::string& path, mode_t mode) {
  const FileDescriptor made(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!made) return lastSystemError();
  const FileDescriptor parent(openat(made.get(), "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!parent) return lastSystemError();
  if (const std::error_code error = giveToOwnerOf(parent.get(), made.get())) return error;
  return fchmod(made.get(), mode) == 0 ? std::error_code() : lastSystemError();
}

std::error_code createDirectory(const std::string& path, mode_t mode) {
  // finishDirectory() has to open the directory before it sets the mode.
  if (mkdir(path.c_str(), mode | S_IRWXU) == 0) return finishDirectory(path, mode);
  const std::error_code error = lastSystemError();
  if (isDirectory(path)) return {};
  return error == std::errc::file_exists ? std::make_error_code(std::errc::not_a_directory) : error;
}

// Renames without replacing anything.
std::error_code renameToNew(int fromDirectory, const std::string& from, int directory,
                            const std::string& name) {
  if (renameat2(fromDirectory, from.c_str(), directory, name.c_str(), RENAME_NOREPLACE) == 0) return {};
  return lastSystemError();
}

// renameToNew() fails with this on a file system that cannot rename without replacing.
constexpr std::errc kNoReplaceUnsupported = std::errc::invalid_argument;

std::string newHiddenName() {
  static thread_local std::random_device random;
  return std::string(kHiddenPrefix) + std::to_string((std::uint64_t{random()} << 32) | random());
}

class HiddenFile final : public NewFile {
 public:
  // Null, with `error` set, if no file can be created in the directory.
  static std::unique_ptr<HiddenFile> make(FileDescriptor directory, std::error_code& error) {
    auto made = std::make_unique<HiddenFile>(std::move(directory));
    error = made->open();
    return error ? nullptr : std::move(made);
  }

  explicit HiddenFile(FileDescriptor directory) : directory_(std::move(directory)) {}
  HiddenFile(const HiddenFile&) = delete;
  HiddenFile& operator=(const HiddenFile&) = delete;
  ~HiddenFile() override { remove(); }

  [[nodiscard]] std::error_code write(std::string_view text) override {
    if (failure_) return failure_;
    if (waiting_.size() + text.size() > kBlockBytes) {
      if (const std::error_code error = writeWaiting()) return error;
    }
    if (text.size() > kBlockBytes) return failure_ = writeAll(file_.get(), text);
    waiting_ += text;
    return {};
  }

  [[nodiscard]] std::error_code place(const std::string& name) override {
    if (!isPlainName(name)) return std::make_error_code(std::errc::invalid_argument);
    if (failure_) return failure_;
    if (const std::error_code error = writeWaiting()) return error;
    // Without this, the file could be incomplete or empty after a crash of the system.
    if (fsync(file_.get()) != 0) return failure_ = lastSystemError();
    std::error_code error = renameToNew(directory_.get(), hiddenName_, directory_.get(), name);
    if (error == kNoReplaceUnsupported) error = moveByLink(name);
    if (error) return error;
    hiddenName_.clear();
    // The name is stored in the directory, which has to be synced separately.
    return fsync(directory_.get()) == 0 ? std::error_code() : lastSystemError();
  }

 private:
  static constexpr int kMaxAttempts = 8;

  [[nodiscard]] std::error_code writeWaiting() {
    failure_ = writeAll(file_.get(), waiting_);
    waiting_.clear();
    return failure_;
  }

  // Another process may take the new file for a leftover before it is locked. Then the next attempt creates
  // another file. If that happens at every attempt, the other process is not looking for leftovers.
  [[nodiscard]] std::error_code open() {
    for (int attempt = 0; attempt < kMaxAttempts; ++attempt) {
      const std::error_code error = create();
      if (error && error != std::errc::file_exists) return error;
      if (!error && lock()) return {};
      remove();
    }
    return std::make_error_code(std::errc::resource_unavailable_try_again);
  }

  [[nodiscard]] std::error_code create() {
    std::string name = newHiddenName();
    constexpr int kFlags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;
    file_ = FileDescriptor(openat(directory_.get(), name.c_str(), kFlags, kFileMode));
    if (!file_) return lastSystemError();
    hiddenName_ = std::move(name);
    return {};
  }

  // False if another process has locked or removed the file.
  //
  // Some file systems do not support locks (network shares, file systems in user space). The file is written
  // without a lock there. That is safe, because a process that cannot lock a file does not remove it as a
  // leftover. If the system is out of locks for a moment, another process may remove the file; then place()
  // fails.
  [[nodiscard]] bool lock() {
    if (flock(file_.get(), LOCK_EX | LOCK_NB) != 0) return errno != EWOULDBLOCK;
    struct stat status {};
    return fstat(file_.get(), &status) != 0 || status.st_nlink > 0;
  }

  [[nodiscard]] std::error_code moveByLink(const std::string& name) {
    if (linkat(directory_.get(), hiddenName_.c_str(), directory_.get(), name.c_str(), 0) != 0)
      return lastSystemError();
    remove();
    return {};
  }

  // Removes the hidden name. The file is gone too, unless it has another name.
  void remove() {
    if (!hiddenName_.empty()) unlinkat(directory_.get(), hiddenName_.c_str(), 0);
    hiddenName_.clear();
  }

  FileDescriptor directory_;
  std::string hiddenName_;  // empty until the file exists, and after it was placed
  FileDescriptor file_;
  std::string waiting_;      // not written yet, at most kBlockBytes
  std::error_code failure_;  // the first one
};

// Removes the file if it is a leftover: a regular file of this user that no process has locked. The lock is
// held until the file is removed. So a process that created the file a moment ago and waits to lock it then
// sees that the file is gone.
void removeIfLeftover(int directory, const char* name) {
  const FileDescriptor file(openat(directory, name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  const bool isLeftover = file && fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode) &&
                          status.st_uid == geteuid() && flock(file.get(), LOCK_EX | LOCK_NB) == 0;
  if (isLeftover) unlinkat(directory, name, 0);
}

std::error_code copyAll(int from, int to) {
  constexpr std::size_t kPieceBytes = std::size_t{16} << 20;
  for (;;) {
    const ssize_t copied = sendfile(to, from, nullptr, kPieceBytes);
    if (copied == 0) return {};
    if (copied < 0 && errno != EINTR) return lastSystemError();
  }
}

// Copies the file `from` to a new file, which is removed if copying fails.
std::error_code copyFile(const std::string& from, int directory, const std::string& name) {
  const FileDescriptor source(open(from.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (!source) return lastSystemError();
  const int descriptor =
      openat(directory, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kFileMode);
  if (descriptor < 0) return lastSystemError();
  std::error_code error = copyAll(source.get(), descriptor);
  // close() has closed the descriptor even if it was interrupted.
  if (::close(descriptor) != 0 && errno != EINTR && !error) error = lastSystemError();
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

std::unique_ptr<NewFile> LinuxFileSystem::createFile(const std::string& directory, const std::string& name,
                                                     std::error_code& error) {
  error.clear();
  if (!isPlainName(name)) {
    error = std::make_error_code(std::errc::invalid_argument);
    return nullptr;
  }
  FileDescriptor parent(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  struct stat status {};
  const bool isTaken = parent && fstatat(parent.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0;
  if (isTaken) {
    error = std::make_error_code(std::errc::file_exists);
  } else if (!parent || errno != ENOENT) {
    error = lastSystemError();
  }
  if (error) return nullptr;
  removeLeftovers(directory, parent.get());
  return HiddenFile::make(std::move(parent), error);
}

void LinuxFileSystem::removeLeftovers(const std::string& path, int directory) {
  {
    const MutexLock lock(mutex_);
    if (!swept_.insert(path).second) return;
  }
  std::error_code error;  // leftovers stay in a directory that cannot be read
  for (std::filesystem::directory_iterator at(path, error), end; !error && at != end; at.increment(error)) {
    const std::string name = at->path().filename().string();
    if (name.starts_with(kHiddenPrefix)) removeIfLeftover(directory, name.c_str());
  }
}

void LinuxFileSystem::removeLeftovers(const std::string& directory) {
  const FileDescriptor opened(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (opened) removeLeftovers(directory, opened.get());
}

std::vector<FileEntry> LinuxFileSystem::listFiles(const std::string& directory,
                                                  std::error_code& error) const {
  std::vector<FileEntry> files;
  error.clear();
  const FileDescriptor opened(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!opened) {
    error = lastSystemError();
    return files;
  }
  for (std::filesystem::directory_iterator at(directory, error), end; !error && at != end;
       at.increment(error)) {
    std::string name = at->path().filename().string();
    struct stat status {};
    // A file may be gone by now.
    if (name.starts_with(kHiddenPrefix) ||
        fstatat(opened.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0 || !S_ISREG(status.st_mode)) {
      continue;
    }
    files.push_back(
        {std::move(name), static_cast<std::uint64_t>(status.st_size),
         static_cast<double>(status.st_mtim.tv_sec) + static_cast<double>(status.st_mtim.tv_nsec) * 1e-9});
  }
  return files;
}

std::error_code LinuxFileSystem::removeFile(const std::string& path) {
  if (path.find('\0') != std::string::npos) return std::make_error_code(std::errc::invalid_argument);
  return unlink(path.c_str()) == 0 ? std::error_code() : lastSystemError();
}

bool LinuxFileSystem::exists(const std::string& path) const {
  struct stat status {};
  return path.find('\0') == std::string::npos && stat(path.c_str(), &status) == 0;
}

std::error_code LinuxFileSystem::readFile(const std::string& path, std::string& text) const {
  if (path.find('\0') != std::string::npos) return std::make_error_code(std::errc::invalid_argument);
  return readFileBytes(path, text);
}

std::error_code LinuxFileSystem::moveFile(const std::string& from, const std::string& directory,
                                          const std::string& name) {
  if (!isPlainName(name)) return std::make_error_code(std::errc::invalid_argument);
  struct stat status {};
  if (lstat(from.c_str(), &status) != 0) return lastSystemError();
  if (!S_ISREG(status.st_mode)) return std::make_error_code(std::errc::operation_not_permitted);
  const FileDescriptor parent(open(directory.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!parent) return lastSystemError();
  const std::error_code error = renameToNew(AT_FDCWD, from, parent.get(), name);
  const bool needsCopy = error == std::errc::cross_device_link || error == kNoReplaceUnsupported;
  return needsCopy ? copyAndRemove(from, parent.get(), name) : error;
}

}  // namespace tonewerk
