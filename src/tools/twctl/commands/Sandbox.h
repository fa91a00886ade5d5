// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace tonewerk {

// A daemon for one command: in directories of its own, below one that is removed with this object. It has no
// D-Bus, because the user's own daemon has its name there. Needs neither rights nor a service manager.
//
// While an object exists, SIGINT, SIGQUIT, SIGTERM and SIGHUP do not end this process. They reach the running
// command, or else end the waiting for the daemon. There may be one object at a time, used on one thread, in
// a process without other threads.
class Sandbox {
 public:
  // `daemonProgram` is the path of the daemon's executable.
  explicit Sandbox(std::string daemonProgram);
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;
  // Kills what still runs, removes the directories unless they are kept, and restores the signals.
  ~Sandbox();

  // Keeps the directories.
  void keep() { isKept_ = true; }
  const std::string& directory() const { return directory_; }
  std::string stateDirectory() const;
  // What a client needs to find this daemon, and no other.
  std::map<std::string, std::string> environment() const;

  // Makes the directories, starts the daemon and waits until it accepts connections. Returns the problem for
  // people; empty when it accepts them.
  [[nodiscard]] std::string start();
  // Runs the command with this process's streams and terminal, and returns its exit status: 128 and the
  // signal's number when a signal has ended it, 127 when there is no such program, 126 when it cannot be
  // executed.
  [[nodiscard]] int run(const std::vector<std::string>& command);
  // Ends the daemon in order, so that its store has everything. Returns the problem for people, else nothing.
  [[nodiscard]] std::string stop();

 private:
  std::string makeDirectories();
  [[nodiscard]] bool accepts() const;
  // Whether the daemon has ended; waits for that for up to `patience`.
  bool hasEnded(std::chrono::milliseconds patience);
  std::string lastWords() const;
  std::string logPath() const { return directory_ + "/daemon.log"; }

  const std::string program_;
  std::string directory_;
  bool isKept_ = false;
  pid_t daemon_ = 0;  // 0 when it does not run
};

}  // namespace tonewerk
