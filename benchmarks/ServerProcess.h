// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <string>
#include <sys/types.h>
#include <vector>

namespace tonewerk {

// A server in a process of its own, with a temporary directory of its own, and what it has cost so far.
//
// A failure throws std::runtime_error. Its end is the server's (SIGTERM, then SIGKILL) and the directory's.
class ServerProcess {
 public:
  using Processor = std::chrono::nanoseconds;

  // An empty directory for a server to come.
  ServerProcess();
  ServerProcess(const ServerProcess&) = delete;
  ServerProcess& operator=(const ServerProcess&) = delete;
  ~ServerProcess();

  const std::string& directory() const { return directory_; }
  std::string socketPath() const { return directory_ + "/reporting.sock"; }

  // Starts it, all its directories being directory(), and waits until it listens at socketPath().
  void start(const std::string& program, const std::vector<std::string>& arguments);

  // Processor time of all its threads, the kernel's work for them included.
  Processor processorTime() const;
  // The same by thread name; of threads that are still there.
  std::map<std::string, Processor> processorTimeByThread() const;
  // The most memory it has had at once, in bytes.
  std::size_t peakMemory() const;

  // Waits until it has nothing left to do: queued work is done, the store's last batch written.
  void waitUntilIdle() const;

 private:
  [[noreturn]] void failWithOutput(const std::string& what) const;
  bool hasEnded();
  void stop();

  std::string directory_;
  pid_t process_ = -1;
};

}  // namespace tonewerk
