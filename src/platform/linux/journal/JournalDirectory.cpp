// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/JournalDirectory.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <cmath>
#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/files/Ownership.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr mode_t kDirectoryMode = 0700;
constexpr mode_t kFileMode = 0600;
constexpr unsigned kParentMode = 0755;
// A disk fails by such pieces.
constexpr std::size_t kReadAgainBytes = 4096;

double secondsOf(const timespec& time) {
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

// A time that no file can have is that of 1970.
timespec timespecOf(double seconds) {
  constexpr double kLatest = 1e11;
  timespec time{};
  if (!(seconds >= 0.0 && seconds < kLatest)) return time;
  const double whole = std::floor(seconds);
  time.tv_sec = static_cast<time_t>(whole);
  time.tv_nsec = static_cast<long>((seconds - whole) * 1e9);
  return time;
}

std::error_code resultOf(int returned) { return returned == 0 ? std::error_code() : lastSystemError(); }

std::error_code syncDirectory(const std::string& path) {
  const FileDescriptor directory(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return directory ? resultOf(fsync(directory.get())) : lastSystemError();
}

// Reads `bytes.size()` bytes at `offset`.
std::error_code readExactly(int file, std::uint64_t offset, std::string& bytes) {
  for (std::size_t at = 0; at < bytes.size();) {
    const ssize_t count = pread(file, bytes.data() + at, bytes.size() - at, static_cast<off_t>(offset + at));
    if (count == 0) return std::make_error_code(std::errc::io_error);
    if (count > 0) {
      at += static_cast<std::size_t>(count);
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
}

std::error_code writeExactly(int file, std::uint64_t offset, std::string_view bytes, std::size_t& written) {
  written = 0;
  while (written < bytes.size()) {
    const ssize_t count =
        pwrite(file, bytes.data() + written, bytes.size() - written, static_cast<off_t>(offset + written));
    if (count == 0) return std::make_error_code(std::errc::io_error);
    if (count > 0) {
      written += static_cast<std::size_t>(count);
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
}

class LinuxJournalFile final : public JournalFile {
 public:
  explicit LinuxJournalFile(FileDescriptor file) : file_(std::move(file)) {}

  [[nodiscard]] std::error_code write(std::uint64_t offset, std::string_view bytes,
                                      std::size_t& written) override {
    if (const std::error_code error = writeExactly(file_.get(), offset, bytes, written)) return error;
    end_.store(offset + bytes.size(), std::memory_order_release);
    return {};
  }

  [[nodiscard]] std::error_code truncate(std::uint64_t bytes) override {
    end_.store(bytes, std::memory_order_release);
    return resultOf(ftruncate(file_.get(), static_cast<off_t>(bytes)));
  }

  [[nodiscard]] std::error_code sync() override {
    const std::uint64_t end = end_.load(std::memory_order_acquire);
    if (hasFailed_) {
      if (const std::error_code error = writeAgain(syncedBytes_, end)) return error;
    }
    hasFailed_ = fdatasync(file_.get()) != 0;
    if (hasFailed_) return lastSystemError();
    syncedBytes_ = std::max(syncedBytes_, end);
    return {};
  }

 private:
  // After a failure the kernel takes what it could not write for written, and the next sync would say that
  // all is well. So it gets these bytes once more. It still has them in memory.
  [[nodiscard]] std::error_code writeAgain(std::uint64_t begin, std::uint64_t end) const {
    std::string piece;
    for (std::uint64_t at = begin; at < end; at += piece.size()) {
      piece.resize(std::min<std::uint64_t>(end - at, kPieceBytes));
      if (const std::error_code error = readExactly(file_.get(), at, piece)) return error;
      std::size_t written = 0;
      if (const std::error_code error = writeExactly(file_.get(), at, piece, written)) return error;
    }
    return {};
  }

  static constexpr std::size_t kPieceBytes = std::size_t{64} << 10;

  const FileDescriptor file_;
  // The end of what was written well. No byte before it is written again, except by writeAgain().
  std::atomic<std::uint64_t> end_ = 0;
  std::uint64_t syncedBytes_ = 0;  // used by sync() alone, like hasFailed_
  bool hasFailed_ = false;
};

// Reads up to `bytes.size()` bytes and shortens `bytes` to what there is.
std::error_code readAll(int file, std::string& bytes) {
  std::size_t at = 0;
  while (at < bytes.size()) {
    const ssize_t count = pread(file, bytes.data() + at, bytes.size() - at, static_cast<off_t>(at));
    if (count == 0) break;
    if (count > 0) {
      at += static_cast<std::size_t>(count);
    } else if (errno == EIO) {
      const std::size_t next = std::min(bytes.size(), (at / kReadAgainBytes + 1) * kReadAgainBytes);
      std::fill(bytes.begin() + static_cast<std::ptrdiff_t>(at),
                bytes.begin() + static_cast<std::ptrdiff_t>(next), '\0');
      at = next;
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  bytes.resize(at);
  return {};
}

}  // namespace

std::error_code LinuxJournalDirectory::open() {
  directory_.reset();
  LinuxFileSystem files;
  const std::string parent = path_.substr(0, path_.rfind('/'));
  const bool isThere = files.exists(path_);
  std::error_code error = files.createDirectories(parent, kParentMode);
  if (!error) error = files.createDirectories(path_, kDirectoryMode);
  if (!error && !isThere) error = syncDirectory(parent);
  if (error) return error;
  FileDescriptor directory(::open(path_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  struct stat status {};
  if (!directory || fstat(directory.get(), &status) != 0) return lastSystemError();
  if ((status.st_mode & ~mode_t{S_IFMT}) != kDirectoryMode && fchmod(directory.get(), kDirectoryMode) != 0) {
    return lastSystemError();
  }
  // File systems without locks are rare, and a second daemon on the same directory is rarer.
  if (flock(directory.get(), LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK) {
    return std::make_error_code(std::errc::device_or_resource_busy);
  }
  directory_ = std::move(directory);
  return {};
}

std::error_code LinuxJournalDirectory::openToRead() {
  directory_ = FileDescriptor(::open(path_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return directory_ ? std::error_code() : lastSystemError();
}

std::error_code LinuxJournalDirectory::list(std::vector<Entry>& entries) const {
  const int copy = openat(directory_.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR* const names = copy >= 0 ? fdopendir(copy) : nullptr;
  if (names == nullptr) {
    const std::error_code error = lastSystemError();
    if (copy >= 0) close(copy);
    return error;
  }
  errno = 0;
  while (const dirent* const name = readdir(names)) {
    struct stat status {};
    const bool isFile =
        fstatat(directory_.get(), name->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(status.st_mode);
    if (isFile) {
      entries.push_back(
          {name->d_name, static_cast<std::uint64_t>(status.st_size), secondsOf(status.st_mtim)});
    }
    errno = 0;
  }
  const std::error_code error = errno == 0 ? std::error_code() : lastSystemError();
  closedir(names);
  return error;
}

std::error_code LinuxJournalDirectory::read(const std::string& name, std::size_t maxBytes,
                                            std::string& bytes) const {
  bytes.clear();
  const FileDescriptor file(
      openat(directory_.get(), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0) return lastSystemError();
  bytes.resize(std::min(maxBytes, static_cast<std::size_t>(status.st_size)));
  return readAll(file.get(), bytes);
}

std::error_code LinuxJournalDirectory::create(const std::string& name, std::shared_ptr<JournalFile>& file) {
  constexpr int kFlags = O_RDWR | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC;
  FileDescriptor made(openat(directory_.get(), name.c_str(), kFlags, kFileMode));
  if (!made) return lastSystemError();
  if (const std::error_code error = giveToOwnerOf(directory_.get(), made.get())) return error;
  file = std::make_shared<LinuxJournalFile>(std::move(made));
  return {};
}

std::error_code LinuxJournalDirectory::truncate(const std::string& name, std::uint64_t bytes) {
  const FileDescriptor file(openat(directory_.get(), name.c_str(), O_WRONLY | O_NOFOLLOW | O_CLOEXEC));
  if (!file) return lastSystemError();
  return resultOf(ftruncate(file.get(), static_cast<off_t>(bytes)));
}

std::error_code LinuxJournalDirectory::rename(const std::string& from, const std::string& to,
                                              double changedAt) {
  const std::array<timespec, 2> times{timespecOf(changedAt), timespecOf(changedAt)};
  if (utimensat(directory_.get(), from.c_str(), times.data(), AT_SYMLINK_NOFOLLOW) != 0)
    return lastSystemError();
  return resultOf(renameat(directory_.get(), from.c_str(), directory_.get(), to.c_str()));
}

std::error_code LinuxJournalDirectory::remove(const std::string& name) {
  return resultOf(unlinkat(directory_.get(), name.c_str(), 0));
}

std::error_code LinuxJournalDirectory::sync() { return resultOf(fsync(directory_.get())); }

}  // namespace tonewerk
