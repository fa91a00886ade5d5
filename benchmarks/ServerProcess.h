// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

namespace tonewerk {

// Runs a server in a process and a temporary directory of its own, and measures its cost.
//
// A failure throws std::runtime_error. The destructor ends the server (SIGTERM, then SIGKILL) and removes the
// directory.
class ServerProcess {
 public:
  static constexpr const char* kSocket = "reporting.sock";

  using Processor = std::chrono::nanoseconds;

  // Makes an empty directory for a server.
  ServerProcess();
  ServerProcess(const ServerProcess&) = delete;
  ServerProcess& operator=(const ServerProcess&) = delete;
  ~ServerProcess();

  const std::string& directory() const { return directory_; }
  // Directories of its own below it, as an installed daemon has: it watches some of them for changes, but
  // not the one with the store.
  std::string stateDirectory() const { return directory_ + "/state"; }
  std::string logsDirectory() const { return directory_ + "/logs"; }
  std::string configurationDirectory() const { return directory_ + "/configuration"; }
  std::string socketPath() const { return directory_ + "/" + kSocket; }

  // Starts the server with directory() as its runtime directory and the other directories, and waits until it
  // listens at socketPath(), or at `socket` in the directory.
  void start(const std::string& program, const std::vector<std::string>& arguments,
             const std::string& socket = kSocket);
  // Kills the server, as a crash would end it, and starts it again with the same directories. Returns when
  // the new one listens, which may be before it answers.
  void crash(const std::string& program);

  // Processor time of all its threads, in user and kernel mode.
  Processor processorTime() const;
  // The same by thread name, of the threads that still run.
  std::map<std::string, Processor> processorTimeByThread() const;
  // Largest resident memory so far, in bytes.
  std::size_t peakMemory() const;
  // Resident memory now, in bytes.
  std::size_t residentMemory() const;
  // How often each of its threads has waited so far, by the thread's number. Each wait ends with a wake-up.
  std::map<std::string, std::uint64_t> waitsByThread() const;
  // What the server has written to its standard output and standard error.
  std::string output() const;

  // Waits until the server is idle: queued work is done, and the store's last batch is written.
  void waitUntilIdle() const;

 private:
  std::size_t statusBytes(std::string_view label) const;
  [[noreturn]] void failWithOutput(const std::string& what) const;
  bool hasEnded();
  void stop();
  void run(const std::string& program, const std::vector<std::string>& arguments, const std::string& socket);
  // Outside of the directory, in which the server may watch every change.
  std::string outputPath() const { return directory_ + ".output"; }

  std::string directory_;
  pid_t process_ = -1;
};

}  // namespace tonewerk
