// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <sys/types.h>

namespace tonewerk {

// Runs a process that reads what senders write and discards it. The process ends with the object, or with the
// process that made it.
class SocketDrain {
 public:
  // Listens for stream sockets at `streamPath`, and receives datagrams at `datagramPath` unless that is
  // empty. Call it before any thread is started.
  SocketDrain(const std::string& streamPath, const std::string& datagramPath);
  SocketDrain(const SocketDrain&) = delete;
  SocketDrain& operator=(const SocketDrain&) = delete;
  ~SocketDrain();

  [[nodiscard]] bool isRunning() const { return process_ > 0; }

 private:
  pid_t process_ = -1;
};

}  // namespace tonewerk
