// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxPlatform.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>

#include "platform/DeviceFacts.h"
#include "platform/PreferenceStore.h"
#include "platform/linux/Directories.h"
#include "support/MemoryDiagwire.h"
#include "support/MemoryEnergybook.h"
#include "support/MemoryLinkReport.h"
#include "support/MemoryMetricon.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

TEST(LinuxPlatformTest, LooksForEverythingWhereTheDirectoriesSay) {
  const TemporaryDirectory root;
  const Directories directories{root.path("run"), root.path("state"), root.path("logs"), root.path("etc")};
  std::filesystem::create_directories(root.path("etc/preferences"));
  std::ofstream(root.path("etc/device-facts.toml")) << "InternalBuild = true\n";
  std::ofstream(root.path("etc/preferences/com.orvane.test.toml")) << "a = 1\n";

  LinuxPlatform linuxPlatform(directories);
  MemoryMetricon metricon;
  MemoryEnergybook energybook;
  MemoryDiagwire diagwire;
  MemoryLinkReport linkReport;
  const Platform platform = linuxPlatform.platform(metricon, energybook, diagwire, linkReport);
  EXPECT_EQ(platform.deviceFacts.boolean("InternalBuild"), true);
  EXPECT_EQ(platform.preferences.read("com.orvane.test", "a"), Value(1));
  EXPECT_FALSE(platform.preferences.write("com.orvane.test", "b", 2));
  EXPECT_TRUE(std::filesystem::exists(root.path("state/preferences/com.orvane.test.toml")));
  EXPECT_EQ(platform.logsDirectory, root.path("logs"));
  EXPECT_EQ(&platform.metricon, &metricon);
  EXPECT_EQ(&platform.energybook, &energybook);
  EXPECT_EQ(&platform.diagwire, &diagwire);
  EXPECT_EQ(&platform.linkReport, &linkReport);
}

}  // namespace
}  // namespace tonewerk
