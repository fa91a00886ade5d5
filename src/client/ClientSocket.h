// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Where a daemon may listen, in the order in which to try; see socketPathsFrom(). A program that runs with
// more rights than its caller does not read the environment variables, which the caller has set.
std::vector<std::string> defaultSocketPaths();

// Sends and receives bytes over the client's end of a connection. Only connect() waits, for at most 200 ms.
// No signal is raised, and executed programs do not inherit the descriptor.
//
// One thread at a time. A forked child process may call close() on its copy.
class ClientSocket {
 public:
  // Both return 0 or an errno. After open() the object may be used and closed, whatever it returned.
  [[nodiscard]] int open();
  [[nodiscard]] int connect(const std::string& path);

  int fileDescriptor() const { return socket_.get(); }
  bool isOpen() const { return static_cast<bool>(socket_); }

  struct Transfer {
    std::size_t bytes = 0;
    int error = 0;       // an errno; EAGAIN when the socket is not ready
    bool isEnd = false;  // of receive(): the daemon has closed its end
  };
  [[nodiscard]] Transfer send(std::string_view bytes);
  [[nodiscard]] Transfer receive(char* into, std::size_t size);

  // Ends the sending direction. The daemon's bytes can still be received.
  void endSending();
  void close() { socket_.reset(); }

 private:
  FileDescriptor socket_;
};

}  // namespace tonewerk
