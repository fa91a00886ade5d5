// SPDX-License-Identifier: Apache-2.0
#include "support/NotifySocket.h"

#include <algorithm>
#include <array>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace tonewerk {

NotifySocket::NotifySocket() : descriptor_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path().copy(address.sun_path, sizeof(address.sun_path) - 1);
  if (bind(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
    ADD_FAILURE() << "cannot bind " << path();
  }
}

NotifySocket::~NotifySocket() { close(descriptor_); }

std::vector<std::string> NotifySocket::take() {
  std::vector<std::string> messages;
  for (std::string message = next({}); !message.empty(); message = next({})) messages.push_back(message);
  return messages;
}

std::string NotifySocket::waitForLine(const std::string& line) {
  const auto end = std::chrono::steady_clock::now() + kPatience;
  for (;;) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
    std::string message = next(std::max(left, std::chrono::milliseconds::zero()));
    if (message.empty() || ("\n" + message + "\n").find("\n" + line + "\n") != std::string::npos) {
      return message;
    }
  }
}

std::string NotifySocket::next(std::chrono::milliseconds timeout) {
  pollfd waited{descriptor_, POLLIN, 0};
  if (poll(&waited, 1, static_cast<int>(timeout.count())) <= 0) return {};
  std::array<char, 4096> buffer{};
  const ssize_t size = recv(descriptor_, buffer.data(), buffer.size(), 0);
  return size > 0 ? std::string(buffer.data(), static_cast<std::size_t>(size)) : std::string();
}

}  // namespace tonewerk
