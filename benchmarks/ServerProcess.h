// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <string>
#include <sys/types.h>
#include <vector>

namespace tonewerk {

// Runs a server in a process and a temporary directory of its own, and measures its cost.
//
// A failure throws std::runtime_error. The destructor ends the server (SIGTERM, then SIGKILL) and removes the
// directory.
class ServerProcess {
 public:
  using Processor = std::chrono::nanoseconds;

  // Makes an empty directory for a server.
  ServerProcess();
  ServerProcess(const ServerProcess&) = delete;
  ServerProcess& operator=(const ServerProcess&) = delete;
  ~ServerProcess();

  const std::string& directory() const { return directory_; }
  std::string socketPath() const { return directory_ + "/reporting.sock"; }

  // Starts the server with directory() as all of its directories, and waits until it listens at socketPath().
  void start(const std::string& program, const std::vector<std::string>& arguments);

  // Processor time of all its threads, in user and kernel mode.
  Processor processorTime() const;
  // The same by thread name, of the threads that still run.
  std::map<std::string, Processor> processorTimeByThread() const;
  // Largest resident memory so far, in bytes.
  std::size_t peakMemory() const;

  // Waits until the server is idle: queued work is done, and the store's last batch is written.
  void waitUntilIdle() const;

 private:
  [[noreturn]] void failWithOutput(const std::string& what) const;
  bool hasEnded();
  void stop();

  std::string directory_;
  pid_t process_ = -1;
};

}  // namespace tonewerk
