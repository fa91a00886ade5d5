// SPDX-License-Identifier: Apache-2.0
//
// The floor of the ingest benchmark: a server that reads the same bytes from the same kind of socket, decodes
// them with the same library and discards them. It answers every request with the smallest possible response,
// so that both servers have the cost of answering.
//
//   tonewerk_floor_server SOCKET     runs until SIGTERM

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <memory>
#include <msgpack.hpp>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <sys/un.h>
#include <unordered_map>
#include <vector>

#include "platform/linux/descriptors/Epoll.h"
#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {
namespace {

constexpr std::size_t kReadBytes = std::size_t{64} * 1024;  // as the daemon does
constexpr std::uint64_t kListener = 0;

class Connection {
 public:
  explicit Connection(FileDescriptor socket) : socket_(std::move(socket)) {}

  int fileDescriptor() const { return socket_.get(); }

  // Reads once, as the daemon does. False when the peer is gone or has sent invalid bytes.
  bool handleReadable() {
    unpacker_.reserve_buffer(kReadBytes);
    const ssize_t count = ::recv(socket_.get(), unpacker_.buffer(), kReadBytes, MSG_DONTWAIT);
    if (count <= 0) return count < 0 && (errno == EAGAIN || errno == EINTR);
    unpacker_.buffer_consumed(static_cast<std::size_t>(count));
    try {
      while (unpacker_.next(frame_)) answer(frame_.get());
    } catch (const std::exception&) {
      return false;
    }
    return send();
  }

 private:
  // Appends [1, identifier, nil, nil] to a request.
  void answer(const msgpack::object& frame) {
    const msgpack::object* elements = frame.via.array.ptr;
    if (frame.via.array.size != 4) return;  // a notification
    msgpack::packer<msgpack::sbuffer> packer(answers_);
    packer.pack_array(4).pack(1);
    packer.pack(elements[1].as<std::uint32_t>()).pack_nil().pack_nil();
  }

  bool send() {
    if (answers_.size() == 0) return true;
    // The benchmark's clients have so few pending requests that the answers always fit into the socket.
    const ssize_t sent = ::send(socket_.get(), answers_.data(), answers_.size(), MSG_NOSIGNAL);
    const bool isSent = sent == static_cast<ssize_t>(answers_.size());
    answers_.clear();
    return isSent;
  }

  FileDescriptor socket_;
  msgpack::unpacker unpacker_;
  msgpack::object_handle frame_;
  msgpack::sbuffer answers_;
};

FileDescriptor listenAt(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof(address.sun_path)) return {};
  std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
  FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (::bind(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) return {};
  return ::listen(socket.get(), SOMAXCONN) == 0 ? std::move(socket) : FileDescriptor();
}

void serve(const FileDescriptor& listener) {
  Epoll epoll;
  if (!epoll.add(listener.get(), kListener, EPOLLIN)) return;
  std::unordered_map<std::uint64_t, std::unique_ptr<Connection>> connections;
  std::uint64_t next = kListener + 1;
  for (;;) {
    for (const Epoll::Event& event : epoll.wait(std::nullopt)) {
      if (event.identifier == kListener) {
        FileDescriptor socket(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
        if (!socket) continue;
        auto connection = std::make_unique<Connection>(std::move(socket));
        if (!epoll.add(connection->fileDescriptor(), next, EPOLLIN))
          continue;  // its client sees an end of file
        connections.emplace(next++, std::move(connection));
      } else if (!connections.at(event.identifier)->handleReadable()) {
        connections.erase(event.identifier);  // closing the socket removes it from the epoll
      }
    }
  }
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  if (argc != 2) {
    std::cerr << "usage: tonewerk_floor_server SOCKET\n";
    return 2;
  }
  const tonewerk::FileDescriptor listener = tonewerk::listenAt(argv[1]);
  if (!listener) {
    std::cerr << "cannot listen at " << argv[1] << ": " << std::strerror(errno) << "\n";
    return EXIT_FAILURE;
  }
  tonewerk::serve(listener);
}
