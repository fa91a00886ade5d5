// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxPlatform.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <unistd.h>

#include "platform/DeviceFacts.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/WhirlcapRequest.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/directories/Directories.h"
#include "platform/linux/tracing/UnavailableTracing.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryJournal.h"
#include "support/memory/reports/MemoryDiagwire.h"
#include "support/memory/reports/MemoryEnergybook.h"
#include "support/memory/reports/MemoryLinkReport.h"
#include "support/memory/reports/MemoryMetricon.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;

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
  const Tracing tracing = makeUnavailableTracing("none");
  MemoryJournal journal;
  const Platform platform = linuxPlatform.platform(linuxPlatform.clock(), metricon, energybook, diagwire,
                                                   linkReport, tracing, journal);
  EXPECT_EQ(platform.deviceFacts.boolean("InternalBuild"), true);
  EXPECT_EQ(platform.preferences.read("com.orvane.test", "a"), Value(1));
  EXPECT_FALSE(platform.preferences.write("com.orvane.test", "b", 2));
  EXPECT_TRUE(std::filesystem::exists(root.path("state/preferences/com.orvane.test.toml")));
  EXPECT_EQ(platform.logsDirectory, root.path("logs"));
  EXPECT_EQ(&platform.metricon, &metricon);
  EXPECT_EQ(&platform.energybook, &energybook);
  EXPECT_EQ(&platform.diagwire, &diagwire);
  EXPECT_EQ(&platform.linkReport, &linkReport);
  EXPECT_EQ(&platform.runtrace, tracing.runtrace.get());
  EXPECT_EQ(&platform.kolvi, tracing.kolvi.get());
  EXPECT_EQ(&platform.clock, &linuxPlatform.clock());
  EXPECT_EQ(platform.journal, &journal);
}

// Runs the collectors of every item on this system.
TEST(LinuxPlatformTest, LeavesEvidenceOfTheSystemWithAStallTrace) {
  const TemporaryDirectory root;
  LinuxPlatform linuxPlatform({root.path("run"), root.path("state"), root.path("logs"), root.path("etc")});
  const Tracing tracing = makeUnavailableTracing("none");
  MemoryMetricon metricon;
  MemoryEnergybook energybook;
  MemoryDiagwire diagwire;
  MemoryLinkReport linkReport;
  MemoryJournal journal;
  const Platform platform = linuxPlatform.platform(linuxPlatform.clock(), metricon, energybook, diagwire,
                                                   linkReport, tracing, journal);
  platform.log.write("com.orvane.tonewerk", "twrs", LogLevel::kError, "a line before");
  platform.whirlcaps.request("com.orvane.tonewerk", "AudioOverloads", "com.example.player", {}, {true, true});
  linuxPlatform.diagnostics().finish(std::chrono::seconds(60));

  const DiagnosticsDirectory items(root.path("state"));
  const auto entries = items.list(DiagnosticKind::kWhirlcap);
  ASSERT_EQ(entries.size(), 1u);
  const auto read = [&](const std::string& file) {
    return items.readFile(DiagnosticKind::kWhirlcap, entries[0].name, file).value_or("");
  };
  EXPECT_THAT(read("request.json"), HasSubstr("AudioOverloads"));
  EXPECT_THAT(read("load.txt"), HasSubstr("/proc/loadavg"));
  EXPECT_THAT(read("log.txt"), HasSubstr("error twrs a line before"));
  EXPECT_THAT(read("processes.txt"), HasSubstr(" " + std::to_string(getpid()) + " "));
  // For sound devices and PipeWire's graph there is either a file or a problem.
  for (const std::string file : {"sound.txt", "pipewire.json"}) {
    EXPECT_TRUE(!read(file).empty() || read("request.json").find(file + "\": \"") != std::string::npos)
        << file;
  }
}

}  // namespace
}  // namespace tonewerk
