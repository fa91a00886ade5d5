// SPDX-License-Identifier: Apache-2.0
#include "SocketDrain.h"

#include <array>
#include <csignal>
#include <optional>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "platform/linux/descriptors/UnixAddress.h"

namespace tonewerk {
namespace {

int boundSocket(const std::string& path, int type) {
  const std::optional<sockaddr_un> address = unixAddressOf(path);
  const int made = address ? ::socket(AF_UNIX, type | SOCK_CLOEXEC, 0) : -1;
  if (made >= 0 && ::bind(made, generic(*address), sizeof(*address)) != 0) return -1;
  if (type == SOCK_STREAM && ::listen(made, 16) != 0) return -1;
  return made;
}

// Never returns.
void drain(int listener, int datagrams) {
  std::vector<pollfd> polled{{listener, POLLIN, 0}};
  if (datagrams >= 0) polled.push_back({datagrams, POLLIN, 0});
  static std::array<char, 1 << 16> bytes;
  for (;;) {
    if (::poll(polled.data(), polled.size(), -1) < 0) continue;
    int accepted = -1;
    for (pollfd& each : polled) {
      if (each.revents == 0) continue;
      if (each.fd == listener) {
        accepted = ::accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
      } else if (::recv(each.fd, bytes.data(), bytes.size(), MSG_DONTWAIT) == 0) {
        ::close(each.fd);
        each.fd = -1;
      }
    }
    if (accepted >= 0) polled.push_back({accepted, POLLIN, 0});
  }
}

}  // namespace

SocketDrain::SocketDrain(const std::string& streamPath, const std::string& datagramPath) {
  const int listener = boundSocket(streamPath, SOCK_STREAM);
  const int datagrams = datagramPath.empty() ? -1 : boundSocket(datagramPath, SOCK_DGRAM);
  if (listener < 0 || (datagrams < 0 && !datagramPath.empty())) return;
  process_ = ::fork();
  if (process_ == 0) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    drain(listener, datagrams);
  }
  ::close(listener);
  if (datagrams >= 0) ::close(datagrams);
}

SocketDrain::~SocketDrain() {
  if (process_ <= 0) return;
  ::kill(process_, SIGKILL);
  ::waitpid(process_, nullptr, 0);
}

}  // namespace tonewerk
