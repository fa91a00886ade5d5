// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <optional>
#include <string>

#include "support/TemporaryDirectory.h"
#include "system/support/ChildProcess.h"

namespace tonewerk {

// The daemon, as a process of its own in directories of its own, which go when the object goes. It finds no
// D-Bus unless it is given the address of one.
//
//   DaemonProcess daemon;
//   daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n");
//   ASSERT_TRUE(daemon.start());
//   ... clients with clientEnvironment() ...
//   EXPECT_EQ(daemon.stop(), 0);
//   ... look at path(kState) and log() ...
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
  // Where a client finds this daemon.
  std::map<std::string, std::string> clientEnvironment() const;

  // Before start(). False when it cannot be written.
  bool writeConfiguration(const std::string& name, const std::string& text) const;
  void setEnvironment(const std::string& name, const std::string& value) { environment_[name] = value; }

  // Starts it and waits until its socket accepts. On failure its log is in the test's failure message. May be
  // called again after stop(), over the same directories.
  bool start();
  // SIGTERM, and its exit status; none when it did not end in time.
  std::optional<int> stop();
  ChildProcess& process() { return process_; }
  bool accepts() const;

  // The memory it has in use, and the descriptors it holds; 0 when it does not run.
  std::size_t residentBytes() const;
  std::size_t openDescriptors() const;

  // Everything it has written to standard error, in all its runs.
  std::string log() const;

 private:
  const TemporaryDirectory directory_;
  std::map<std::string, std::string> environment_;
  ChildProcess process_;
};

}  // namespace tonewerk
