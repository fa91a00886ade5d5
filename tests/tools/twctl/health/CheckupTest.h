// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <map>
#include <optional>
#include <string>
#include <sys/stat.h>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "tools/twctl/health/Checkup.h"
#include "values/Value.h"

namespace tonewerk {

// A device on which nothing is wrong: its directories, and a daemon that answers. A test breaks one thing.
class CheckupTest : public testing::Test {
 protected:
  static constexpr double kNow = 1'800'000'000.0;
  static constexpr double kMebibyte = 1024.0 * 1024.0;

  CheckupTest() {
    checkup.directories = {.runtime = directory.path("runtime"),
                           .state = directory.path("state"),
                           .logs = directory.path("logs"),
                           .configuration = directory.path("configuration")};
    for (const char* name : {"runtime", "state/preferences", "logs", "configuration/preferences"})
      std::filesystem::create_directories(directory.path(name));
    checkup.sockets = {directory.path("runtime/reporting.sock")};
    checkup.ownVersion = "1.0";
    checkup.storeMegabytes = 256;
    checkup.store.path = directory.path("state/reports.db");
    checkup.daemon.answers = true;
    checkup.daemon.isConnected = true;
    checkup.daemon.daemon = {{"version", "1.0"},        {"processIdentifier", 42}, {"user", ::geteuid()},
                             {"startedAt", kNow - 100}, {"seconds", 100.0},        {"internalBuild", false}};
    checkup.daemon.sinks = ValueArray();
    checkup.daemon.endpoints = ValueArray();
    checkup.daemon.troubles = ValueArray();
    Surroundings& around = checkup.around;
    around.user = ::geteuid();
    around.groups = {::getegid()};
    around.now = kNow;
    around.environment = [this](const std::string& name) {
      const auto found = environment.find(name);
      return found == environment.end() ? std::nullopt : std::optional(found->second);
    };
    around.groupName = [](gid_t) { return "audio"; };
    around.isMember = [this](gid_t) { return isMember; };
    around.userNumber = [](const std::string&) -> std::optional<uid_t> { return 990; };
    around.connect = [this](const std::string&) { return connecting; };
    around.reach = [this](const std::string& host, const std::string& port) {
      reached.push_back(host + " " + port);
      return unreachable;
    };
    around.space = [this](const std::string&) { return std::optional(Surroundings::Space{freeBytes}); };
    around.systemctl = [this](const std::vector<std::string>& arguments) -> std::optional<std::string> {
      return arguments.back() == "tw-pipewire.service" ? bridgeUnit : units;
    };
    around.bridges = [this] { return bridges; };
  }

  // What a check finds, as "name: what".
  using Check = void (*)(const Checkup&, Findings&);
  std::vector<std::string> find(Check check) {
    Findings findings;
    check(checkup, findings);
    std::vector<std::string> texts;
    remedies.clear();
    for (const Finding& finding : findings.all()) {
      texts.push_back(std::string(finding.kind->name) + ": " + finding.what);
      remedies.push_back(finding.remedy);
    }
    unseen = findings.unseen();
    return texts;
  }

  void write(const std::string& name, const std::string& text) {
    std::ofstream(directory.path(name)) << text;
  }
  void allow(const std::string& name, mode_t mode) {
    ASSERT_EQ(chmod(directory.path(name).c_str(), mode), 0);
  }

  TemporaryDirectory directory;
  Checkup checkup;
  std::map<std::string, std::string> environment;
  bool isMember = false;
  std::error_code connecting;
  std::vector<std::string> reached;
  std::string unreachable;
  std::uint64_t freeBytes = std::uint64_t{1} << 40;
  std::optional<std::string> units = "";
  std::optional<std::string> bridgeUnit = "";
  std::vector<BridgeProcess> bridges;
  std::vector<std::string> remedies;  // of the last find()
  std::vector<std::string> unseen;
};

}  // namespace tonewerk
