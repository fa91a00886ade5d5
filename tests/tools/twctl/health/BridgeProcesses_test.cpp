// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/BridgeProcesses.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>
#include <unistd.h>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

TEST(BridgeProcessesTest, AreThoseOfTheBridgesName) {
  const TemporaryDirectory processes;
  const auto add = [&](const std::string& directory, const std::string& name) {
    std::filesystem::create_directory(processes.path(directory));
    std::ofstream(processes.path(directory + "/comm")) << name << '\n';
  };
  add("17", "tw-pipewire");
  add("5", "tw-pipewire");
  add("6", "pipewire");
  add("7x", "tw-pipewire");
  add("self", "tw-pipewire");
  const std::vector<BridgeProcess> found = findBridges(processes.path());
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].identifier, 5);
  EXPECT_EQ(found[1].identifier, 17);
  EXPECT_EQ(found[0].user, ::geteuid());
}

TEST(BridgeProcessesTest, AreNoneWhereProcessesCannotBeSeen) {
  const TemporaryDirectory processes;
  EXPECT_TRUE(findBridges(processes.path("nowhere")).empty());
}

}  // namespace
}  // namespace tonewerk
