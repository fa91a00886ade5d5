// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <fstream>
#include <gmock/gmock.h>
#include <memory>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"
#include "support/ScopedTimeZone.h"
#include "support/TemporaryDirectory.h"
#include "tools/twctl/ScriptedDaemon.h"
#include "tools/twctl/commands/Commands.h"

namespace tonewerk {

// Runs twctl with its own directories and socket, in UTC.
class CommandLineTest : public testing::Test {
 protected:
  CommandLineTest() {
    setenv("TONEWERK_REPORTING_SOCKET", socket_.c_str(), 1);
    setenv("RUNTIME_DIRECTORY", directory_.path("runtime").c_str(), 1);
    setenv("STATE_DIRECTORY", directory_.path("state").c_str(), 1);
    setenv("CONFIGURATION_DIRECTORY", directory_.path("configuration").c_str(), 1);
  }
  void TearDown() override {
    for (const char* name :
         {"TONEWERK_REPORTING_SOCKET", "RUNTIME_DIRECTORY", "STATE_DIRECTORY", "CONFIGURATION_DIRECTORY"})
      unsetenv(name);
  }

  // Returns the exit status. output() and errors() return what was printed.
  int run(const std::vector<std::string>& arguments) {
    std::vector<const char*> argv{"twctl"};
    for (const std::string& argument : arguments) argv.push_back(argument.c_str());
    out_.str({});
    err_.str({});
    Tool tool{out_, err_, json_};
    return runCommandLine(static_cast<int>(argv.size()), argv.data(), tool);
  }
  std::string output() const { return out_.str(); }
  std::string errors() const { return err_.str(); }

  ScriptedDaemon& daemon() {
    if (daemon_ == nullptr) daemon_ = std::make_unique<ScriptedDaemon>(socket_);
    return *daemon_;
  }
  std::string write(const std::string& name, const std::string& text) {
    std::ofstream(directory_.path(name)) << text;
    return directory_.path(name);
  }

  const ScopedTimeZone zone_{"UTC0"};
  TemporaryDirectory directory_;
  const std::string socket_ = directory_.path("reporting.sock");
  NlohmannJsonService json_;
  std::ostringstream out_;
  std::ostringstream err_;
  std::unique_ptr<ScriptedDaemon> daemon_;
};

}  // namespace tonewerk
