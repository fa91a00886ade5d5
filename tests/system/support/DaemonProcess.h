// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <optional>
#include <string>

#include "support/TemporaryDirectory.h"
#include "system/support/ChildProcess.h"

namespace tonewerk {

// Runs the daemon in a process and in directories of its own, which are removed with the object. The daemon
// has no D-Bus unless a test sets the address of one.
//
//   DaemonProcess daemon;
//   daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n");
//   ASSERT_TRUE(daemon.start());
//   ... clients with clientEnvironment() ...
//   EXPECT_EQ(daemon.stop(), 0);
//   ... check path(kState) and log() ...
class DaemonProcess {
 public:
  static constexpr const char* kRuntime = "runtime";
  static constexpr const char* kState = "state";
  static constexpr const char* kLogs = "logs";
  static constexpr const char* kConfiguration = "configuration";

  // Makes the directories.
  DaemonProcess();

  // `directory` is one of the four above, `name` a path in it.
  std::string path(const char* directory, const std::string& name = {}) const;
  std::string socketPath() const { return path(kRuntime, "reporting.sock"); }
  std::string storePath() const { return path(kState, "reports.db"); }
  // The environment in which a client finds this daemon.
  std::map<std::string, std::string> clientEnvironment() const;

  // Call it before start(). False when the file cannot be written.
  bool writeConfiguration(const std::string& name, const std::string& text) const;
  void setEnvironment(const std::string& name, const std::string& value) { environment_[name] = value; }

  // Starts the daemon and waits until its socket accepts connections. On failure its log is in the test's
  // failure message. May be called again after stop(), with the same directories.
  bool start();
  // Only starts it.
  bool startWithoutWaiting();
  // Sends SIGTERM and returns the exit status; none when the daemon did not end in time.
  std::optional<int> stop();
  ChildProcess& process() { return process_; }
  bool accepts() const;

  // Its resident memory and its number of open descriptors; 0 when it does not run.
  std::size_t residentBytes() const;
  std::size_t openDescriptors() const;

  // Everything that it has written to standard error in all its runs.
  std::string log() const;

 private:
  const TemporaryDirectory directory_;
  std::map<std::string, std::string> environment_;
  ChildProcess process_;
};

}  // namespace tonewerk
