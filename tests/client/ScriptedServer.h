// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cerrno>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <gtest/gtest.h>
#include <memory>
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
#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {

// Long enough for the slowest machine. Only a failing test waits so long.
inline constexpr int kScriptPatienceMs = 30'000;

// A frame's method and parameters, such as `setServiceType 7 77`, followed by `?` when it is a request.
inline std::string textOf(const RpcFrame& frame) {
  std::string text = frame.method;
  for (const Argument& argument : frame.arguments) text += " " + (argument ? argument->text() : "nil");
  return frame.kind == RpcFrame::Kind::kRequest ? text + " ?" : text;
}

// The daemon's end of a connection. It only does what the test calls. A frame that does not come in time is a
// test failure.
class ScriptedConnection {
 public:
  explicit ScriptedConnection(FileDescriptor socket) : socket_(std::move(socket)) {}

  // Reads the next frame; one without a method when none came.
  RpcFrame next() {
    std::string_view rest = unread_;
    RpcFrameReader::Result result = reader_.next(rest);
    unread_.erase(0, unread_.size() - rest.size());
    while (result == RpcFrameReader::Result::kNeedsMore && readMore(kScriptPatienceMs)) {
      rest = unread_;
      result = reader_.next(rest);
      unread_.erase(0, unread_.size() - rest.size());
    }
    EXPECT_EQ(result, RpcFrameReader::Result::kFrame) << reader_.problem();
    return result == RpcFrameReader::Result::kFrame ? std::move(reader_.frame()) : RpcFrame();
  }
  std::string nextText() { return textOf(next()); }
  std::vector<std::string> nextTexts(std::size_t count) {
    std::vector<std::string> texts;
    while (texts.size() < count) texts.push_back(nextText());
    return texts;
  }
  // Reads the next frame and returns its first parameter, which must be a map.
  ValueMap nextMap() {
    const RpcFrame frame = next();
    const bool hasMap =
        !frame.arguments.empty() && frame.arguments[0] && frame.arguments[0]->asMap() != nullptr;
    EXPECT_TRUE(hasMap) << textOf(frame);
    return hasMap ? *frame.arguments[0]->asMap() : ValueMap();
  }

  // True when the client closes the connection, or its half of it, without another frame.
  bool waitForEnd() {
    while (readMore(kScriptPatienceMs)) {
      std::string_view rest = unread_;
      if (reader_.next(rest) != RpcFrameReader::Result::kNeedsMore) return false;
      unread_.erase(0, unread_.size() - rest.size());
    }
    return hasEnded_;
  }

  void answer(std::uint32_t identifier, const std::optional<Value>& result) {
    std::string bytes;
    RpcWriter(bytes).response(identifier, std::nullopt, result);
    write(bytes);
  }
  void refuse(std::uint32_t identifier, const ReplyError& error) {
    std::string bytes;
    RpcWriter(bytes).response(identifier, error, std::nullopt);
    write(bytes);
  }
  void write(std::string_view bytes) {
    EXPECT_EQ(::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL),
              static_cast<ssize_t>(bytes.size()));
  }
  // Reads and drops so many bytes.
  void swallow(std::size_t bytes) {
    std::array<char, 4096> buffer;
    while (bytes > 0) {
      const ssize_t count = ::recv(socket_.get(), buffer.data(), std::min(bytes, buffer.size()), MSG_WAITALL);
      ASSERT_GT(count, 0);
      bytes -= static_cast<std::size_t>(count);
    }
  }
  int fileDescriptor() const { return socket_.get(); }

 private:
  bool readMore(int patience) {
    pollfd polled{socket_.get(), POLLIN, 0};
    if (::poll(&polled, 1, patience) != 1) return false;
    std::array<char, 65536> buffer;
    const ssize_t count = ::recv(socket_.get(), buffer.data(), buffer.size(), 0);
    hasEnded_ = count == 0 || (count < 0 && errno == ECONNRESET);
    if (count <= 0) return false;
    unread_.append(buffer.data(), static_cast<std::size_t>(count));
    return true;
  }

  FileDescriptor socket_;
  RpcStrings texts_;
  RpcFrameReader reader_{texts_};
  std::string unread_;
  bool hasEnded_ = false;
};

// Listens on a socket and accepts clients.
class ScriptedServer {
 public:
  explicit ScriptedServer(const std::string& path) {
    ::unlink(path.c_str());
    const std::optional<sockaddr_un> address = unixAddressOf(path);
    listener_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    EXPECT_EQ(::bind(listener_.get(), generic(*address), sizeof(*address)), 0);
    EXPECT_EQ(::listen(listener_.get(), 8), 0);
  }

  // Accepts the next client; a test failure, and null, when none comes in time.
  std::unique_ptr<ScriptedConnection> accept(int patience = kScriptPatienceMs) {
    pollfd polled{listener_.get(), POLLIN, 0};
    if (::poll(&polled, 1, patience) != 1) {
      ADD_FAILURE() << "nobody connects";
      return nullptr;
    }
    return std::make_unique<ScriptedConnection>(
        FileDescriptor(::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC)));
  }
  // True when a client has connected and was not accepted yet.
  bool hasCaller() const {
    pollfd polled{listener_.get(), POLLIN, 0};
    return ::poll(&polled, 1, 0) == 1;
  }

 private:
  FileDescriptor listener_;
};

}  // namespace tonewerk
