// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <bit>
#include <cstdint>
#include <cstring>
#include <gtest/gtest.h>
#include <poll.h>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/dbus/DbusBytes.h"
#include "platform/linux/dbus/DbusService.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"

namespace tonewerk {

// Calls the service as a program of a machine with the other byte order, such as one behind an emulator or a
// tunnel. It writes its messages itself, because the library writes only this machine's order.
class ForeignDbusCaller {
 public:
  static constexpr std::endian kOrder =
      std::endian::native == std::endian::little ? std::endian::big : std::endian::little;

  // The answer to a call, in this machine's byte order.
  struct Answer {
    std::string error;  // its name; empty without
    std::string signature;
    std::string body;

    // Read the first value of the body.
    template <typename T>
    T number() const {
      T value{};
      EXPECT_GE(body.size(), sizeof(value)) << error;
      std::memcpy(&value, body.data(), std::min(sizeof(value), body.size()));
      return value;
    }
    std::string text() const {
      const auto size = number<std::uint32_t>();
      return body.size() < sizeof(size) + size ? "" : body.substr(sizeof(size), size);
    }
  };

  // `address` is the address of a bus with a path.
  ForeignDbusCaller(const std::string& address, DbusNames names) : names_(std::move(names)) {
    const auto path = unixAddressOf(address.substr(address.find('/')));
    socket_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    EXPECT_EQ(::connect(socket_.get(), generic(*path), sizeof(*path)), 0);
    authenticate();
    const DbusNames bus{"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus"};
    EXPECT_EQ(ask(bus, "Hello", "", body()).signature, "s");
  }

  static DbusBytes body() { return DbusBytes(kOrder); }

  Answer ask(const std::string& member, std::string_view signature, const DbusBytes& body) {
    return ask(names_, member, signature, body);
  }
  Answer ask(const std::string& member) { return ask(member, "", body()); }
  // Does not wait. The answer is skipped.
  void send(const std::string& member, std::string_view signature, const DbusBytes& body) {
    write(callTo(names_, member, signature, body));
  }

 private:
  static constexpr int kPatienceMs = 30'000;
  static constexpr std::size_t kFixedBytes = 16;

  Answer ask(const DbusNames& to, const std::string& member, std::string_view signature,
             const DbusBytes& body) {
    write(callTo(to, member, signature, body));
    const std::uint32_t serial = serial_;
    for (;;) {
      const std::string header = read(kFixedBytes);
      if (header.size() < kFixedBytes) return {};
      // The answers come from programs of this machine.
      EXPECT_EQ(header[0], std::endian::native == std::endian::little ? 'l' : 'B');
      const std::string fields = read((numberAt(header, 12) + 7) / 8 * 8);
      Answer answer = answerOf(fields, serial);
      answer.body = read(numberAt(header, 4));
      if (isAnswer_) return answer;
    }
  }

  std::string callTo(const DbusNames& to, const std::string& member, std::string_view signature,
                     const DbusBytes& body) {
    return dbusCallOf({to.path, member, to.interface, to.name}, signature, body.text(), kOrder, ++serial_,
                      true);
  }

  // Reads a header's fields. Sets isAnswer_ when the message answers `serial`; others, such as signals, are
  // skipped.
  Answer answerOf(const std::string& fields, std::uint32_t serial) {
    Answer answer;
    isAnswer_ = false;
    std::size_t at = 0;
    while (at + 4 < fields.size() && fields[at] != 0) {
      const int code = fields[at];
      const char type = fields[at + 2];
      at += 4;
      std::string text;
      if (type == 'u') {
        isAnswer_ = isAnswer_ || (code == 5 && numberAt(fields, at) == serial);
        at += 4;
      } else {
        const bool isShort = type == 'g';
        const std::size_t size = isShort ? static_cast<unsigned char>(fields[at]) : numberAt(fields, at);
        at += isShort ? 1 : 4;
        text = fields.substr(at, size);
        at += size + 1;
      }
      if (code == 4) answer.error = text;
      if (code == 8) answer.signature = text;
      at = (at + 7) / 8 * 8;
    }
    return answer;
  }

  void authenticate() {
    std::string user;
    for (const char digit : std::to_string(::getuid())) user += std::string("3") + digit;  // in hexadecimal
    write(std::string(1, '\0') + "AUTH EXTERNAL " + user + "\r\n");
    std::string line;
    while (!line.ends_with("\r\n")) {
      const std::string byte = read(1);
      if (byte.empty()) return;
      line += byte;
    }
    EXPECT_TRUE(line.starts_with("OK ")) << line;
    write("BEGIN\r\n");
  }

  static std::uint32_t numberAt(const std::string& bytes, std::size_t at) {
    std::uint32_t number = 0;
    std::memcpy(&number, bytes.data() + at, sizeof(number));
    return number;
  }

  void write(const std::string& bytes) const {
    EXPECT_EQ(::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL),
              static_cast<ssize_t>(bytes.size()));
  }
  // Reads `size` bytes. Fails the test and returns fewer when they do not come.
  std::string read(std::size_t size) const {
    std::string bytes;
    while (bytes.size() < size) {
      pollfd polled{socket_.get(), POLLIN, 0};
      std::array<char, 4096> buffer;
      const ssize_t count =
          ::poll(&polled, 1, kPatienceMs) == 1
              ? ::recv(socket_.get(), buffer.data(), std::min(buffer.size(), size - bytes.size()), 0)
              : 0;
      if (count <= 0) {
        ADD_FAILURE() << "the bus says nothing more";
        return bytes;
      }
      bytes.append(buffer.data(), static_cast<std::size_t>(count));
    }
    return bytes;
  }

  const DbusNames names_;
  FileDescriptor socket_;
  std::uint32_t serial_ = 0;
  bool isAnswer_ = false;
};

}  // namespace tonewerk
