// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Where a daemon may listen, in the order in which to try: TONEWERK_REPORTING_SOCKET alone when it is set,
// else in this process's own runtime directory, then in the system's. A program that runs with more rights
// than its caller has reads no variables of the caller's.
std::vector<std::string> defaultSocketPaths();

// The client's end of a connection, as bytes. Nothing here waits but connect(), for a fifth of a second at
// most; no signal is raised, and no program that is executed inherits the descriptor.
//
// One thread at a time; close() may also be called in a child process, about its copy.
class ClientSocket {
 public:
  // 0 or an errno. After open(), whatever it returned, the object may be used and closed.
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

  // No more is sent; what the daemon says can still be received.
  void endSending();
  void close() { socket_.reset(); }

 private:
  FileDescriptor socket_;
};

}  // namespace tonewerk
