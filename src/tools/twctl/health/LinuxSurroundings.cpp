// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <grp.h>
#include <netdb.h>
#include <poll.h>
#include <pwd.h>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/commands/BoundedCommand.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "tools/twctl/health/Checkup.h"

namespace tonewerk {
namespace {

constexpr int kReachTimeoutMs = 3000;
constexpr BoundedCommand::Limits kSystemctlLimits{.time = std::chrono::seconds(10), .bytes = 1U << 20};

std::error_code systemError() { return {errno, std::generic_category()}; }

std::string groupNameOf(gid_t group) {
  std::array<char, 4096> texts{};
  struct ::group entry {};
  struct ::group* found = nullptr;
  if (getgrgid_r(group, &entry, texts.data(), texts.size(), &found) != 0 || found == nullptr)
    return std::to_string(group);
  return found->gr_name;
}

bool isMemberOf(gid_t group, uid_t user) {
  std::array<char, 4096> texts{};
  passwd entry{};
  passwd* found = nullptr;
  if (getpwuid_r(user, &entry, texts.data(), texts.size(), &found) != 0 || found == nullptr) return false;
  std::vector<gid_t> groups(64);
  int count = static_cast<int>(groups.size());
  if (getgrouplist(found->pw_name, found->pw_gid, groups.data(), &count) < 0) return false;
  return std::find(groups.begin(), groups.begin() + count, group) != groups.begin() + count;
}

std::optional<uid_t> userNumberOf(const std::string& name) {
  std::array<char, 4096> texts{};
  passwd entry{};
  passwd* found = nullptr;
  if (getpwnam_r(name.c_str(), &entry, texts.data(), texts.size(), &found) != 0 || found == nullptr)
    return std::nullopt;
  return found->pw_uid;
}

std::error_code connectTo(const std::string& path) {
  const std::optional<sockaddr_un> address = unixAddressOf(path);
  if (!address) return std::make_error_code(std::errc::filename_too_long);
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  const bool isConnected = ::connect(socket.get(), generic(*address), sizeof(*address)) == 0;
  return isConnected ? std::error_code() : systemError();
}

// Tries one address of the host; the error of the connection.
std::error_code reachAddress(const addrinfo& address) {
  const FileDescriptor socket(::socket(address.ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!socket) return systemError();
  if (::connect(socket.get(), address.ai_addr, address.ai_addrlen) == 0) return {};
  if (errno != EINPROGRESS) return systemError();
  pollfd polled{socket.get(), POLLOUT, 0};
  if (::poll(&polled, 1, kReachTimeoutMs) <= 0) return std::make_error_code(std::errc::timed_out);
  int error = 0;
  socklen_t size = sizeof(error);
  if (getsockopt(socket.get(), SOL_SOCKET, SO_ERROR, &error, &size) != 0) return systemError();
  return {error, std::generic_category()};
}

std::string reachHost(const std::string& host, const std::string& port) {
  addrinfo hints{};
  hints.ai_socktype = SOCK_STREAM;
  addrinfo* found = nullptr;
  if (const int failure = getaddrinfo(host.c_str(), port.c_str(), &hints, &found); failure != 0)
    return gai_strerror(failure);
  std::error_code error;
  for (const addrinfo* address = found; address != nullptr; address = address->ai_next) {
    error = reachAddress(*address);
    if (!error) break;
  }
  freeaddrinfo(found);
  return error ? error.message() : "";
}

std::optional<Surroundings::Space> spaceAt(const std::string& path) {
  struct statvfs status {};
  if (statvfs(path.c_str(), &status) != 0) return std::nullopt;
  return Surroundings::Space{status.f_bavail * status.f_frsize};
}

// Without systemd there are no units, and nothing is hidden from the caller.
std::optional<std::string> runSystemctl(const std::vector<std::string>& arguments) {
  std::error_code error;
  if (!std::filesystem::exists("/run/systemd/system", error)) return "";
  std::vector<std::string> command{"systemctl"};
  command.insert(command.end(), arguments.begin(), arguments.end());
  const BoundedCommand::Result result = BoundedCommand(std::move(command), kSystemctlLimits).run();
  if (result.end != BoundedCommand::End::kExited || result.status != 0) return std::nullopt;
  return result.output;
}

std::vector<gid_t> ownGroups() {
  std::vector<gid_t> groups(static_cast<std::size_t>(std::max(0, getgroups(0, nullptr))));
  groups.resize(
      static_cast<std::size_t>(std::max(0, getgroups(static_cast<int>(groups.size()), groups.data()))));
  groups.push_back(getegid());
  return groups;
}

}  // namespace

Surroundings linuxSurroundings() {
  Surroundings around;
  around.user = geteuid();
  around.groups = ownGroups();
  around.now = std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  around.environment = [](const std::string& name) -> std::optional<std::string> {
    const char* value = std::getenv(name.c_str());
    return value == nullptr ? std::nullopt : std::optional<std::string>(value);
  };
  around.groupName = groupNameOf;
  around.isMember = [user = around.user](gid_t group) { return isMemberOf(group, user); };
  around.userNumber = userNumberOf;
  around.connect = connectTo;
  around.reach = reachHost;
  around.space = spaceAt;
  around.systemctl = runSystemctl;
  around.bridges = [] { return findBridges(); };
  return around;
}

}  // namespace tonewerk
