// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "support/TemporaryDirectory.h"
#include "system/support/ChildProcess.h"

namespace tonewerk {

// A sound graph of the test's own: PipeWire, its session manager and their bus, without sound hardware, in a
// runtime directory and a home of their own.
class PrivatePipeWire {
 public:
  PrivatePipeWire();

  // False, with a test failure, when it does not come up. May be called again after stop().
  bool start();
  void stop();
  // A sink that swallows what it is given; the first becomes the default. It is gone after stop().
  bool addSink(const std::string& name, const std::string& description);

  // The processes of the graph, and its players, run with this.
  std::map<std::string, std::string> environment() const;
  std::optional<std::string> outputOf(const std::string& program, std::vector<std::string> arguments) const;

  // A two-channel sine tone of so many seconds as a sound file; its path.
  std::string makeTone(int seconds) const;

  // The node of this name in the state "running"; none when there is none.
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
