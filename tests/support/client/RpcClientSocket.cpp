// SPDX-License-Identifier: Apache-2.0
#include "support/client/RpcClientSocket.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <limits>
#include <optional>
#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <utility>

#include "platform/linux/descriptors/UnixAddress.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

constexpr std::size_t kReadBytes = std::size_t{64} * 1024;

std::error_code lastError() { return {errno, std::generic_category()}; }

int pollTimeout(milliseconds timeout) {
  const auto maximum = static_cast<milliseconds::rep>(std::numeric_limits<int>::max());
  return static_cast<int>(std::clamp<milliseconds::rep>(timeout.count(), 0, maximum));
}

timeval timevalOf(milliseconds timeout) {
  // Zero would mean to wait for ever, so it becomes the shortest time.
  const auto count = std::max<milliseconds::rep>(timeout.count(), 1);
  timeval time{};
  time.tv_sec = count / 1000;
  time.tv_usec = count % 1000 * 1000;
  return time;
}

// Waits until the socket is ready for one of `events`. Returns 0 when `timeout` passed first, or on an error.
[[nodiscard]] short waitFor(int descriptor, short events, milliseconds timeout, std::error_code& error) {
  const auto until = std::chrono::steady_clock::now() + timeout;
  for (;;) {
    pollfd polled{descriptor, events, 0};
    const auto left = std::chrono::ceil<milliseconds>(until - std::chrono::steady_clock::now());
    if (::poll(&polled, 1, pollTimeout(left)) >= 0) return polled.revents;
    if (errno == EINTR) continue;
    error = lastError();
    return 0;
  }
}

}  // namespace

std::error_code RpcClientSocket::connect(const std::string& path, milliseconds timeout) {
  const std::optional<sockaddr_un> address = unixAddressOf(path);
  if (!address) return std::make_error_code(std::errc::filename_too_long);
  socket_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!socket_) return lastError();
  const timeval limit = timevalOf(timeout);
  ::setsockopt(socket_.get(), SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof(limit));
  while (::connect(socket_.get(), generic(*address), sizeof(*address)) != 0) {
    if (errno == EINTR) continue;
    const std::error_code error = lastError();
    socket_.reset();
    return error == std::errc::resource_unavailable_try_again ? std::make_error_code(std::errc::timed_out)
                                                              : error;
  }
  return {};
}

std::error_code RpcClientSocket::send(std::string_view frame, milliseconds timeout) {
  while (!frame.empty()) {
    const ssize_t count = ::send(socket_.get(), frame.data(), frame.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count >= 0) {
      frame.remove_prefix(static_cast<std::size_t>(count));
      continue;
    }
    if (errno == EINTR) continue;
    if (errno != EAGAIN) return lastError();
    std::error_code error;
    const short ready = waitFor(socket_.get(), POLLIN | POLLOUT, timeout, error);
    if (error) return error;
    if (ready == 0) return std::make_error_code(std::errc::timed_out);
    if ((ready & POLLIN) != 0) error = readAvailable();
    if (error) return error;
  }
  return {};
}

std::error_code RpcClientSocket::receive(milliseconds timeout) {
  std::error_code error;
  if (waitFor(socket_.get(), POLLIN, timeout, error) != 0) return readAvailable();
  return error ? error : std::make_error_code(std::errc::timed_out);
}

std::error_code RpcClientSocket::readAvailable() {
  std::array<char, kReadBytes> bytes;
  for (;;) {
    const ssize_t count = ::recv(socket_.get(), bytes.data(), bytes.size(), MSG_DONTWAIT);
    if (count > 0) {
      if (const std::error_code error = decode({bytes.data(), static_cast<std::size_t>(count)})) return error;
    } else if (count == 0) {
      return std::make_error_code(std::errc::connection_reset);
    } else if (errno == EAGAIN) {
      return {};
    } else if (errno != EINTR) {
      return lastError();
    }
  }
}

std::error_code RpcClientSocket::decode(std::string_view bytes) {
  RpcFrameReader::Result result = reader_.next(bytes);
  for (; result == RpcFrameReader::Result::kFrame; result = reader_.next(bytes)) {
    const RpcFrame& frame = reader_.frame();
    if (frame.kind != RpcFrame::Kind::kResponse || frame.refused) {
      return std::make_error_code(std::errc::bad_message);
    }
    arrived_.push_back(std::move(reader_.frame()));
  }
  return result == RpcFrameReader::Result::kBroken ? std::make_error_code(std::errc::bad_message)
                                                   : std::error_code();
}

}  // namespace tonewerk
