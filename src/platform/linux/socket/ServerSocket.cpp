// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/ServerSocket.h"

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <optional>
#include <sys/file.h>
#include <sys/stat.h>
#include <system_error>
#include <systemd/sd-daemon.h>
#include <utility>

#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/system/LinuxProcessInformation.h"

namespace tonewerk {
namespace {

constexpr mode_t kSocketMode = 0660;

std::string textOfErrno(int number) { return std::generic_category().message(number); }

FileDescriptor newSocket() {
  return FileDescriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
}

std::string directoryOf(const std::string& path) {
  const std::string directory = std::filesystem::path(path).parent_path().string();
  return directory.empty() ? "." : directory;
}

// What to do when the directory is locked, as operations of flock().
constexpr int kWait = LOCK_EX;
constexpr int kDoNotWait = LOCK_EX | LOCK_NB;

// Locks the socket's directory while the socket's file is examined and replaced or removed, so that of two
// daemons that start together one sees the other. Holds no lock when the directory cannot be opened; binding
// the socket fails then, too.
class DirectoryLock {
 public:
  DirectoryLock(const std::string& path, int operation)
      : directory_(::open(directoryOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    int result = 0;
    do {
      result = directory_ ? ::flock(directory_.get(), operation) : 0;
    } while (result != 0 && errno == EINTR);
    isHeldElsewhere_ = result != 0 && errno == EWOULDBLOCK;
  }

  // True when another process has the lock, with kDoNotWait.
  bool isHeldElsewhere() const { return isHeldElsewhere_; }

 private:
  FileDescriptor directory_;
  bool isHeldElsewhere_ = false;
};

// "name (pid)" of the process behind the other end of a connected socket.
std::string peerOf(int descriptor) {
  ucred peer{};
  socklen_t size = sizeof(peer);
  if (::getsockopt(descriptor, SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0) return "another process";
  const std::string name = LinuxProcessInformation().processName(peer.pid).value_or("another process");
  return name + " (" + std::to_string(peer.pid) + ")";
}

// The process that listens at `address`; none when no process does.
std::optional<std::string> listenerAt(const sockaddr_un& address) {
  const FileDescriptor probe = newSocket();
  if (::connect(probe.get(), generic(address), sizeof(address)) == 0) return peerOf(probe.get());
  // A listener whose backlog is full is still a listener.
  return errno == EAGAIN ? std::optional<std::string>("another process") : std::nullopt;
}

// The path of a bound socket's file; empty when it has none.
std::string pathOf(int descriptor) {
  sockaddr_un address{};
  socklen_t size = sizeof(address);
  if (::getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size) != 0) return {};
  const std::size_t length = size - std::min<std::size_t>(size, offsetof(sockaddr_un, sun_path));
  return {address.sun_path, ::strnlen(address.sun_path, length)};
}

// Removes the file of a socket on which no process listens. False, with `problem`, when `path` is in use or
// cannot be removed.
bool removeUnusedSocket(const std::string& path, const sockaddr_un& address, std::string& problem) {
  struct stat there {};
  if (::lstat(path.c_str(), &there) != 0) return true;
  if (!S_ISSOCK(there.st_mode)) {
    problem = path + " is there and no socket";
    return false;
  }
  if (const auto listener = listenerAt(address)) {
    problem = path + " is in use by " + *listener;
    return false;
  }
  if (::unlink(path.c_str()) == 0) return true;
  problem = "cannot replace " + path + ": " + textOfErrno(errno);
  return false;
}

}  // namespace

std::unique_ptr<ServerSocket> ServerSocket::open(const std::string& path, std::string& problem) {
  if (auto passed = fromSystemd()) return passed;
  return bound(path, kWait, problem);
}

std::unique_ptr<ServerSocket> ServerSocket::fromSystemd() {
  const int count = ::sd_listen_fds(1);
  for (int at = 0; at < count; ++at) {
    const int descriptor = SD_LISTEN_FDS_START + at;
    if (::sd_is_socket_unix(descriptor, SOCK_STREAM, 1, nullptr, 0) <= 0) continue;
    ::fcntl(descriptor, F_SETFL, ::fcntl(descriptor, F_GETFL) | O_NONBLOCK);
    auto socket = std::unique_ptr<ServerSocket>(new ServerSocket(FileDescriptor(descriptor)));
    socket->name_ = "the socket that systemd passed";
    socket->isSystemds_ = true;
    socket->recordFile(pathOf(descriptor));
    return socket;
  }
  return nullptr;
}

std::unique_ptr<ServerSocket> ServerSocket::bound(const std::string& path, int lockOperation,
                                                  std::string& problem) {
  const std::optional<sockaddr_un> address = unixAddressOf(path);
  if (!address) {
    problem = "a socket's path cannot be \"" + path + "\"";
    return nullptr;
  }
  std::error_code failure;
  std::filesystem::create_directories(directoryOf(path), failure);
  if (failure) {
    problem = "cannot make " + directoryOf(path) + ": " + failure.message();
    return nullptr;
  }

  const DirectoryLock lock(path, lockOperation);
  if (lock.isHeldElsewhere()) {
    problem = directoryOf(path) + " is locked by another process";
    return nullptr;
  }
  if (!removeUnusedSocket(path, *address, problem)) return nullptr;
  auto socket = std::unique_ptr<ServerSocket>(new ServerSocket(newSocket()));
  const int descriptor = socket->fileDescriptor();
  // No client can connect before listen(), so the mode is right from the start.
  if (::bind(descriptor, generic(*address), sizeof(*address)) != 0 ||
      ::chmod(path.c_str(), kSocketMode) != 0 || ::listen(descriptor, SOMAXCONN) != 0) {
    problem = "cannot listen at " + path + ": " + textOfErrno(errno);
    return nullptr;
  }
  socket->name_ = path;
  socket->recordFile(path);
  return socket;
}

void ServerSocket::recordFile(const std::string& path) {
  path_ = path;
  struct stat made {};
  if (::lstat(path.c_str(), &made) != 0) return;  // already gone, so isInPlace() is false
  device_ = made.st_dev;
  inode_ = made.st_ino;
}

bool ServerSocket::isInPlace() const {
  if (path_.empty()) return true;
  struct stat there {};
  return ::lstat(path_.c_str(), &there) == 0 && there.st_dev == device_ && there.st_ino == inode_;
}

std::unique_ptr<ServerSocket> ServerSocket::recreate(std::string& problem) const {
  if (isSystemds_) {
    problem = path_ + " was made by systemd, which has to make it again: restart twreportingd.socket";
    return nullptr;
  }
  std::error_code error;
  if (!std::filesystem::is_directory(directoryOf(path_), error)) {
    problem = path_ + " went with its directory, and comes back with it";
    return nullptr;
  }
  // Does not wait: any process that may read the directory may lock it for any length of time, and clients
  // would have to wait for it.
  return bound(path_, kDoNotWait, problem);
}

ServerSocket::~ServerSocket() {
  if (path_.empty() || isSystemds_ || !isInPlace()) return;
  // When another process has the lock the file stays, and the next daemon replaces it.
  const DirectoryLock lock(path_, kDoNotWait);
  if (!lock.isHeldElsewhere() && isInPlace()) ::unlink(path_.c_str());
}

}  // namespace tonewerk
