// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cerrno>
#include <optional>
#include <poll.h>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <utility>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/messagepack/RpcFrameReader.h"

namespace tonewerk {

// Connects to the daemon's socket and sends any bytes.
class RawClient {
 public:
  explicit RawClient(const std::string& path) : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    const auto address = unixAddressOf(path);
    isConnected_ = address && ::connect(socket_.get(), generic(*address), sizeof(*address)) == 0;
  }

  bool isConnected() const { return isConnected_; }
  int fileDescriptor() const { return socket_.get(); }
  void shutDown(int how) { ::shutdown(socket_.get(), how); }
  void close() { socket_.reset(); }

  // False when the other side has closed the connection.
  bool send(std::string_view bytes) {
    while (!bytes.empty()) {
      const ssize_t count = ::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
      if (count < 0 && errno == EINTR) continue;
      if (count < 0) return false;
      bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
  }

  // Sends what the socket takes without waiting, and returns the number of bytes.
  std::size_t sendWithoutWaiting(std::string_view bytes) {
    const ssize_t count = ::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    return count < 0 ? 0 : static_cast<std::size_t>(count);
  }

  // The next response. None at the end of the connection or when none comes within 30 seconds.
  [[nodiscard]] std::optional<RpcFrame> response() {
    for (;;) {
      std::string_view bytes = unread_;
      const RpcFrameReader::Result result = reader_.next(bytes);
      unread_.erase(0, unread_.size() - bytes.size());
      if (result == RpcFrameReader::Result::kFrame) return std::move(reader_.frame());
      if (result == RpcFrameReader::Result::kBroken || !receive()) return std::nullopt;
    }
  }

  // True when the other side ends the connection within 30 seconds. Skips the bytes before that.
  [[nodiscard]] bool waitForEnd() {
    while (receive()) {
    }
    return hasEnded_;
  }

 private:
  [[nodiscard]] bool receive() {
    pollfd polled{socket_.get(), POLLIN, 0};
    if (::poll(&polled, 1, 30'000) <= 0) return false;
    std::array<char, 4096> bytes;
    const ssize_t count = ::recv(socket_.get(), bytes.data(), bytes.size(), 0);
    hasEnded_ = count == 0 || (count < 0 && errno == ECONNRESET);
    if (count <= 0) return false;
    unread_.append(bytes.data(), static_cast<std::size_t>(count));
    return true;
  }

  FileDescriptor socket_;
  bool isConnected_ = false;
  bool hasEnded_ = false;
  RpcStrings texts_;
  RpcFrameReader reader_{texts_};
  std::string unread_;
};

}  // namespace tonewerk
