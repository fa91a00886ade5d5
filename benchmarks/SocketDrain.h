// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <sys/types.h>

namespace tonewerk {

// The other side of what senders write: a process that reads and throws away. Ends with the object, or with
// the process that made it.
class SocketDrain {
 public:
  // Listens at `streamPath` for stream sockets, and takes the datagrams of `datagramPath` unless it is empty.
  // Call it before there are threads.
  SocketDrain(const std::string& streamPath, const std::string& datagramPath);
  SocketDrain(const SocketDrain&) = delete;
  SocketDrain& operator=(const SocketDrain&) = delete;
  ~SocketDrain();

  [[nodiscard]] bool isRunning() const { return process_ > 0; }

 private:
  pid_t process_ = -1;
};

}  // namespace tonewerk
