// SPDX-License-Identifier: Apache-2.0
#include "JournalSocket.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <optional>
#include <sched.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <system_error>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"

namespace tonewerk {
namespace {

bool isAnswered() {
  const std::optional<sockaddr_un> address = unixAddressOf(JournalSocket::kPath);
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  return address && ::connect(socket.get(), generic(*address), sizeof(*address)) == 0;
}

bool failed(const char* what, std::string& problem) {
  problem = std::string(what) + ": " + std::strerror(errno);
  return false;
}

// Gives this process and its children a private, empty /run.
bool hideRun(std::string& problem) {
  const int own = ::geteuid() == 0 ? CLONE_NEWNS : CLONE_NEWNS | CLONE_NEWUSER;
  if (::unshare(own) != 0) return failed("no mount namespace", problem);
  if (::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
    return failed("mounts stay shared", problem);
  }
  if (::mount("tmpfs", "/run", "tmpfs", 0, nullptr) != 0) return failed("no /run", problem);
  std::error_code error;
  std::filesystem::create_directories(std::filesystem::path(JournalSocket::kPath).parent_path(), error);
  problem = error ? error.message() : std::string();
  return !error;
}

}  // namespace

JournalSocket::Kind JournalSocket::prepare(std::string& problem) {
  if (isAnswered()) return Kind::kReal;
  return hideRun(problem) ? Kind::kOwn : Kind::kNone;
}

}  // namespace tonewerk
