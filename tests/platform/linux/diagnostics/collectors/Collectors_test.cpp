// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <unistd.h>

#include "platform/linux/diagnostics/collectors/LoadCollector.h"
#include "platform/linux/diagnostics/collectors/PipeWireGraphCollector.h"
#include "platform/linux/diagnostics/collectors/ProcessTable.h"
#include "platform/linux/diagnostics/collectors/ProcessTableCollector.h"
#include "platform/linux/diagnostics/collectors/SoundStatusCollector.h"
#include "platform/linux/diagnostics/collectors/StandardCollectors.h"
#include "platform/linux/log/RecentLines.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::StartsWith;

// A directory in which tests write files like the kernel's.
class CollectorsTest : public testing::Test {
 protected:
  void put(const std::string& name, const std::string& text) {
    const std::filesystem::path path = directory.path(name);
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path) << text;
  }

  void putProcess(int identifier, const std::string& name, int userTicks, const std::string& status) {
    const std::string number = std::to_string(identifier);
    put(number + "/stat", number + " (" + name + ") S 1 1 1 0 -1 0 0 0 0 0 " + std::to_string(userTicks) +
                              " 50 0 0 20 0 3 0 100 0 0\n");
    put(number + "/status", "Name:\tx\n" + status);
  }

  TemporaryDirectory directory;
};

TEST_F(CollectorsTest, ReadsTheProcessTable) {
  const long ticks = sysconf(_SC_CLK_TCK);
  putProcess(20, "b) R (c", static_cast<int>(2 * ticks) - 50,
             "VmLck:\t      8 kB\nVmRSS:\t    100 kB\nRssAnon:\t     40 kB\nVmSwap:\t      2 kB\n");
  putProcess(3, "kthread", 0, "Threads:\t1\n");
  put("self/stat", "no number");
  put("007/stat", "no process");
  put("30/stat", "cut (off");
  const std::vector<ProcessRow> rows = readProcessTable(directory.path());
  ASSERT_EQ(rows.size(), 2u);
  EXPECT_EQ(rows[0].identifier, 3);
  EXPECT_EQ(rows[0].privateBytes, 0u);
  EXPECT_EQ(rows[1].identifier, 20);
  EXPECT_EQ(rows[1].parent, 1);
  EXPECT_EQ(rows[1].state, 'S');
  EXPECT_EQ(rows[1].threads, 3);
  EXPECT_DOUBLE_EQ(rows[1].processorSeconds, 2.0);
  EXPECT_EQ(rows[1].name, "b) R (c");
  EXPECT_EQ(rows[1].residentBytes, 100u * 1024);
  EXPECT_EQ(rows[1].privateBytes, 42u * 1024);
  EXPECT_EQ(rows[1].lockedBytes, 8u * 1024);
}

TEST_F(CollectorsTest, AProcessNameThatIsCutInACharacterIsStillText) {
  putProcess(20, "lecteur-musiqu\xC3", 0, "");
  EXPECT_EQ(readProcessTable(directory.path()).at(0).name, "lecteur-musiqu\uFFFD");
}

TEST_F(CollectorsTest, AStateThatIsNoLetterKeepsTheTextAText) {
  putProcess(20, "player", 0, "");
  put("20/stat", "20 (player) \xC3 1 1 1 0 -1 0 0 0 0 0 0 0 0 0 20 0 3 0 100 0 0");
  EXPECT_EQ(readProcessTable(directory.path()).at(0).state, '?');
}

TEST_F(CollectorsTest, ReadsTheKernelsProcessTable) {
  const std::vector<ProcessRow> rows = readProcessTable();
  const auto own = std::find_if(rows.begin(), rows.end(),
                                [](const ProcessRow& row) { return row.identifier == getpid(); });
  ASSERT_NE(own, rows.end());
  EXPECT_EQ(own->parent, getppid());
  EXPECT_GT(own->residentBytes, 0u);
  EXPECT_GT(own->privateBytes, 0u);
  EXPECT_GE(own->threads, 1);
}

TEST_F(CollectorsTest, ListsProcessesThatHadTheMostProcessorTimeFirst) {
  putProcess(10, "idle", 0, "");
  putProcess(11, "bu\nsy", 1000, "VmRSS:\t    100 kB\n");
  const DiagnosticCollector::Result result = ProcessTableCollector(directory.path()).collect();
  EXPECT_EQ(result.problem, "");
  EXPECT_THAT(result.text, StartsWith("     pid   parent S threads  processor_s resident_kib"));
  EXPECT_THAT(
      result.text,
      HasSubstr("      11        1 S       3        10.50          100            0          0  bu?sy\n"
                "      10        1 S       3         0.50            0            0          0  idle\n"));
}

TEST_F(CollectorsTest, NamesTheNumberOfProcessesLeftOut) {
  for (int identifier = 1; identifier <= 3; ++identifier) putProcess(identifier, "p", 0, "");
  EXPECT_EQ(ProcessTableCollector(directory.path(), 3).collect().problem, "");
  const DiagnosticCollector::Result result = ProcessTableCollector(directory.path(), 2).collect();
  EXPECT_EQ(result.problem, "left out: 1 processes");
  EXPECT_EQ(std::count(result.text.begin(), result.text.end(), '\n'), 3);
}

TEST_F(CollectorsTest, SaysWhenThereAreNoProcesses) {
  const DiagnosticCollector::Result result = ProcessTableCollector(directory.path("none")).collect();
  EXPECT_EQ(result.text, "");
  EXPECT_EQ(result.problem, "no processes in " + directory.path("none"));
}

TEST_F(CollectorsTest, CollectsLoadAndPressure) {
  put("loadavg", "0.5 0.4 0.3 1/100 5\n");
  put("pressure/cpu", "some avg10=0.00\n");
  put("pressure/io", "some avg10=1.00\n");
  const std::string memory = directory.path("pressure/memory");
  const DiagnosticCollector::Result result = LoadCollector(directory.path()).collect();
  EXPECT_EQ(result.text, "== " + directory.path("loadavg") +
                             "\n0.5 0.4 0.3 1/100 5\n== " + directory.path("pressure/cpu") +
                             "\nsome avg10=0.00\n== " + directory.path("pressure/io") +
                             "\nsome avg10=1.00\n");
  EXPECT_EQ(result.problem, memory + ": No such file or directory");
}

TEST_F(CollectorsTest, CollectsTheKernelsLoad) {
  EXPECT_THAT(LoadCollector().collect().text, StartsWith("== /proc/loadavg\n"));
}

TEST_F(CollectorsTest, CollectsSoundDevicesInOrderWithoutFollowingLinks) {
  put("cards", " 0 [Dummy ]\n");
  put("card0/pcm0p/sub0/status", "state: RUNNING\n");
  put("card0/id", "Dummy");
  std::filesystem::create_directory_symlink("card0", directory.path("Dummy"));
  std::filesystem::create_symlink("/etc/passwd", directory.path("link"));
  const DiagnosticCollector::Result result = SoundStatusCollector(directory.path()).collect();
  EXPECT_EQ(result.problem, "");
  EXPECT_EQ(result.text, "== " + directory.path("card0/id") +
                             "\nDummy\n== " + directory.path("card0/pcm0p/sub0/status") +
                             "\nstate: RUNNING\n== " + directory.path("cards") + "\n 0 [Dummy ]\n");
}

TEST_F(CollectorsTest, LimitsFilesAndBytesOfSoundDevices) {
  put("a", "12345");
  put("b/c", "12345");
  put("b/d/e", "deep");
  const auto collect = [this](const SoundStatusCollector::Limits& limits) {
    return SoundStatusCollector(directory.path(), limits).collect();
  };
  EXPECT_EQ(collect({3, 100, 1000, 2}).problem, "");
  EXPECT_EQ(collect({2, 100, 1000, 2}).problem, "more than 2 files");
  EXPECT_THAT(collect({3, 4, 1000, 2}).text, HasSubstr("\n1234\n(cut)\n"));
  EXPECT_THAT(collect({3, 100, 1000, 1}).text, Not(HasSubstr("deep")));
  const DiagnosticCollector::Result cut = collect({3, 100, directory.path().size() + 20, 2});
  EXPECT_THAT(cut.problem, StartsWith("more than "));
  EXPECT_EQ(cut.text, "== " + directory.path("a") + "\n12345\n");
}

TEST_F(CollectorsTest, CutsTheFileOfASoundDeviceBetweenCharacters) {
  put("a", "123\u00E9");
  EXPECT_THAT(SoundStatusCollector(directory.path(), {3, 4, 1000, 2}).collect().text,
              HasSubstr("\n123\n(cut)\n"));
}

TEST_F(CollectorsTest, SaysWhenThereAreNoSoundDevices) {
  const DiagnosticCollector::Result result = SoundStatusCollector(directory.path("asound")).collect();
  EXPECT_EQ(result.text, "");
  EXPECT_EQ(result.problem, directory.path("asound") + ": No such file or directory");
}

TEST_F(CollectorsTest, CollectsPipeWiresGraph) {
  const DiagnosticCollector::Result result = PipeWireGraphCollector({"echo", "[]"}).collect();
  EXPECT_EQ(result.text, "[]\n");
  EXPECT_EQ(result.problem, "");
}

TEST_F(CollectorsTest, SaysWhyThereIsNoPipeWireGraph) {
  EXPECT_EQ(PipeWireGraphCollector({"/nowhere/pw-dump"}).collect().problem,
            "/nowhere/pw-dump: No such file or directory");
  EXPECT_EQ(PipeWireGraphCollector({"false"}).collect().problem, "false: ended with status 1");
  EXPECT_EQ(PipeWireGraphCollector({"true"}).collect().problem, "true: no output");
  EXPECT_EQ(PipeWireGraphCollector({"sleep", "1000"}, {100ms, 1000}).collect().problem,
            "sleep: timed out after 100 ms");
  const DiagnosticCollector::Result endless = PipeWireGraphCollector({"yes"}, {30s, 1000}).collect();
  EXPECT_EQ(endless.problem, "yes: wrote more than 1000 bytes");
  EXPECT_EQ(endless.text.size(), 1000u);
}

TEST_F(CollectorsTest, RunsTheQuickestCollectorsFirst) {
  std::vector<std::string> names;
  for (const auto& collector : makeStandardCollectors(std::make_shared<RecentLines>())) {
    names.emplace_back(collector->fileName());
  }
  EXPECT_THAT(names, ElementsAre("load.txt", "log.txt", "processes.txt", "sound.txt", "pipewire.json"));
}

}  // namespace
}  // namespace tonewerk
