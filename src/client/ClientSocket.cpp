// SPDX-License-Identifier: Apache-2.0
#include "client/ClientSocket.h"

#include <cerrno>
#include <cstdlib>
#include <optional>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/directories/SocketPaths.h"

namespace tonewerk {
namespace {

// How long connect() waits while the daemon's queue of clients to accept is full.
constexpr timeval kConnectTimeout{0, 200'000};

ClientSocket::Transfer failure(int error) {
  ClientSocket::Transfer transfer;
  transfer.error = error;
  return transfer;
}

std::optional<std::string> variable(const std::string& name) {
  const char* value = ::secure_getenv(name.c_str());
  return value == nullptr ? std::nullopt : std::optional<std::string>(value);
}

}  // namespace

std::vector<std::string> defaultSocketPaths() { return socketPathsFrom(variable, ::geteuid()); }

int ClientSocket::open() {
  socket_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!socket_) return errno;
  ::setsockopt(socket_.get(), SOL_SOCKET, SO_SNDTIMEO, &kConnectTimeout, sizeof(kConnectTimeout));
  return 0;
}

int ClientSocket::connect(const std::string& path) {
  const std::optional<sockaddr_un> address = unixAddressOf(path);
  if (!address) return ENAMETOOLONG;
  while (::connect(socket_.get(), generic(*address), sizeof(*address)) != 0) {
    if (errno != EINTR) return errno;
  }
  return 0;
}

ClientSocket::Transfer ClientSocket::send(std::string_view bytes) {
  for (;;) {
    const ssize_t count = ::send(socket_.get(), bytes.data(), bytes.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count >= 0) return {static_cast<std::size_t>(count), 0, false};
    if (errno != EINTR) return failure(errno);
  }
}

ClientSocket::Transfer ClientSocket::receive(char* into, std::size_t size) {
  for (;;) {
    const ssize_t count = ::recv(socket_.get(), into, size, MSG_DONTWAIT);
    if (count >= 0) return {static_cast<std::size_t>(count), 0, count == 0};
    if (errno != EINTR) return failure(errno);
  }
}

void ClientSocket::endSending() { ::shutdown(socket_.get(), SHUT_WR); }

}  // namespace tonewerk
