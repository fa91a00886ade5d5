// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "support/TemporaryDirectory.h"
#include "system/support/ChildProcess.h"

namespace tonewerk {

// Runs a private audio graph for a test: PipeWire, its session manager and a bus, without sound hardware, in
// a private runtime directory and home.
class PrivatePipeWire {
 public:
  PrivatePipeWire();

  // False, with a test failure, when it does not start. May be called again after stop().
  bool start();
  void stop();
  // Adds a sink that discards its audio; the first one becomes the default. It is gone after stop().
  bool addSink(const std::string& name, const std::string& description);

  // The environment of the graph's processes and of its players.
  std::map<std::string, std::string> environment() const;
  std::optional<std::string> outputOf(const std::string& program, std::vector<std::string> arguments) const;

  // Writes a two-channel sine tone of `seconds` seconds to a sound file, and returns its path.
  std::string makeTone(int seconds) const;

  // The node of this name in the state "running", if there is one.
  std::optional<std::uint32_t> runningNode(const std::string& name) const;
  bool hasNode(const std::string& name) const;

  std::string log() const;
  const TemporaryDirectory& directory() const { return directory_; }

 private:
  bool startProcess(ChildProcess& process, const std::string& program, std::vector<std::string> arguments);
  bool hasClient(const std::string& name) const;

  const TemporaryDirectory directory_;
  ChildProcess bus_;
  ChildProcess pipewire_;
  ChildProcess sessionManager_;
};

}  // namespace tonewerk
