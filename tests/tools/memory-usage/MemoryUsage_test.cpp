// SPDX-License-Identifier: Apache-2.0
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <unistd.h>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "tools/memory-usage/MemoryUsageCommand.h"
#include "tools/memory-usage/ProcReader.h"
#include "tools/memory-usage/UsageReport.h"
#include "workers/diagnostics/MemoryLogTool.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr double kTicks = 100.0;

// A directory with the layout of /proc.
class MemoryUsageTest : public ::testing::Test {
 protected:
  MemoryUsageTest() {
    write("meminfo",
          "MemTotal:        8000000 kB\nMemFree:         3000000 kB\nSwapTotal:       1000000 kB\n"
          "SwapFree:         900000 kB\nMlocked:             400 kB\nAnonPages:       2000000 kB\n"
          "SUnreclaim:       100000 kB\nKernelStack:       20000 kB\nPageTables:        3000 kB\n");
    write("stat", "cpu  1000 200 300 99999 50 25 100 0 0 0\ncpu0 1 2 3\n");
    write("uptime", "no process\n");
    write("self/status", "Name:\tnot counted twice\n");
  }

  void write(const std::string& name, const std::string& text) {
    const std::filesystem::path path = directory.path(name);
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path) << text;
  }
  static std::string statusOf(const std::string& name, int anonymous, int swapped = 0, int locked = 0,
                              int pinned = 0) {
    return "Name:\t" + name + "\nUmask:\t0022\nUid:\t1000\t1000\t1000\t1000\nVmLck:\t" +
           std::to_string(locked) + " kB\nVmPin:\t" + std::to_string(pinned) + " kB\nRssAnon:\t" +
           std::to_string(anonymous) + " kB\nRssFile:\t 30 kB\nRssShmem:\t 4 kB\nVmSwap:\t" +
           std::to_string(swapped) + " kB\n";
  }
  static std::string statOf(const std::string& name, int userTicks, int systemTicks) {
    return "1 (" + name + ") S 1 1 1 0 -1 4194560 1 2 3 4 " + std::to_string(userTicks) + " " +
           std::to_string(systemTicks) + " 0 0 20 0 1 0 5\n";
  }
  void addProcess(int number, const std::string& name, int anonymous, int swapped = 0, int locked = 0,
                  int pinned = 0, int userTicks = 0, int systemTicks = 0) {
    const std::string own = std::to_string(number);
    write(own + "/status", statusOf(name, anonymous, swapped, locked, pinned));
    write(own + "/stat", statOf(name, userTicks, systemTicks));
  }
  UsageSnapshot read() const {
    std::string problem;
    auto snapshot = ProcReader(directory.path(), kTicks).read(problem);
    EXPECT_TRUE(snapshot) << problem;
    return snapshot.value_or(UsageSnapshot());
  }
  std::vector<std::string> namesBy(UsageOrder order) const {
    UsageSnapshot snapshot = read();
    sortProcesses(snapshot.processes, order);
    std::vector<std::string> names;
    for (const ProcessUsage& process : snapshot.processes) names.push_back(process.name);
    return names;
  }

  struct Run {
    int status;
    std::string out;
    std::string err;
    std::vector<std::string> lines() const {
      std::vector<std::string> lines;
      std::istringstream text(out);
      for (std::string line; std::getline(text, line);) lines.push_back(line);
      return lines;
    }
  };
  static Run run(std::vector<const char*> arguments) {
    std::ostringstream out;
    std::ostringstream err;
    arguments.insert(arguments.begin(), "tw-memory-usage");
    const int status = runMemoryUsage(static_cast<int>(arguments.size()), arguments.data(), out, err);
    return {status, out.str(), err.str()};
  }
  Run runHere(std::vector<const char*> arguments = {}) const {
    arguments.insert(arguments.end(), {"--proc", directory.path().c_str()});
    return run(std::move(arguments));
  }

  TemporaryDirectory directory;
};

TEST_F(MemoryUsageTest, ReadsAProcessMemoryTimeAndUser) {
  addProcess(42, "pipewire", 20000, 500, 64, 8, 1250, 75);
  const UsageSnapshot snapshot = read();
  ASSERT_THAT(snapshot.processes, SizeIs(1));
  const ProcessUsage& process = snapshot.processes[0];
  EXPECT_EQ(process.process, 42);
  EXPECT_EQ(process.name, "pipewire");
  EXPECT_EQ(process.user, 1000U);
  EXPECT_EQ(process.usage, (MemoryUsage{12.5, 0.75, 20000, 34, 64, 8, 500}));
  EXPECT_EQ(process.usage.footprint(), 20500U);
  EXPECT_EQ(process.usage.resident(), 20034U);
  EXPECT_EQ(process.usage.wired(), 72U);
}

TEST_F(MemoryUsageTest, ReadsTheWholeSystem) {
  EXPECT_EQ(read().system, (MemoryUsage{12.0, 4.25, 2000000, 3000000, 400, 123000, 100000}));
}

TEST_F(MemoryUsageTest, ThreadsOfTheKernelAndProcessesThatHaveEndedAreLeftOut) {
  write("2/status", "Name:\tkthreadd\nUid:\t0\t0\t0\t0\n");
  write("2/stat", statOf("kthreadd", 1, 1));
  const UsageSnapshot snapshot = read();
  EXPECT_THAT(snapshot.processes, IsEmpty());
  EXPECT_EQ(snapshot.unreadable, 0U);
}

TEST_F(MemoryUsageTest, AProcessThatEndsMeanwhileIsLeftOut) {
  std::filesystem::create_directories(directory.path("7"));  // ended before its first file was read
  write("8/status", statusOf("halfway", 100));               // ended before its second file was read
  const UsageSnapshot snapshot = read();
  EXPECT_THAT(snapshot.processes, IsEmpty());
  EXPECT_EQ(snapshot.unreadable, 0U);
}

TEST_F(MemoryUsageTest, AnUnreadableProcessIsCountedAndReported) {
  addProcess(42, "readable", 100);
  std::filesystem::create_directories(
      directory.path("7/status"));  // not even root can read a directory as a file
  write("8/status", statusOf("odd", 100));
  write("8/stat", "8 (odd) S 1\n");
  EXPECT_EQ(read().unreadable, 2U);
  EXPECT_THAT(runHere().out, HasSubstr("  total of 1 process, 2 processes could not be read\n"));
}

TEST_F(MemoryUsageTest, ANameMayHoldAnything) {
  addProcess(42, "a) R (b\x1b[2J\xff", 100, 0, 0, 0, 250);
  const UsageSnapshot snapshot = read();
  ASSERT_THAT(snapshot.processes, SizeIs(1));
  EXPECT_EQ(snapshot.processes[0].name, "a) R (b?[2J?");
  EXPECT_EQ(snapshot.processes[0].usage.userSeconds, 2.5);
  EXPECT_EQ(nlohmann::json::parse(runHere({"--json"}).lines().at(0)).at("name"), "a) R (b?[2J?");
}

TEST_F(MemoryUsageTest, SortsByWhatIsAskedForLargestFirst) {
  addProcess(1, "footprint", 100, 900);
  addProcess(2, "resident", 500);
  addProcess(3, "wired", 10, 0, 5, 6);
  addProcess(4, "cpu", 20, 0, 10, 0, 500, 500);
  EXPECT_THAT(namesBy(UsageOrder::kFootprint), ElementsAre("footprint", "resident", "cpu", "wired"));
  EXPECT_THAT(namesBy(UsageOrder::kResident), ElementsAre("resident", "footprint", "cpu", "wired"));
  EXPECT_THAT(namesBy(UsageOrder::kWired), ElementsAre("wired", "cpu", "footprint", "resident"));
  EXPECT_THAT(namesBy(UsageOrder::kProcessorTime), ElementsAre("cpu", "footprint", "resident", "wired"));
  EXPECT_THAT(namesBy(UsageOrder::kProcess), ElementsAre("footprint", "resident", "wired", "cpu"));
}

TEST_F(MemoryUsageTest, PrintsEachProcessThenTheTotalThenTheSystem) {
  addProcess(42, "pipewire", 20000, 500, 64, 8, 1250, 75);
  addProcess(43, "idle", 100);
  EXPECT_EQ(runHere().out.substr(0, runHere().out.find("  the whole")),
            "       RESOURCE      TOTAL       FIRST      SECOND      MOSTLY  42 pipewire (user 1000)\n"
            "       cpu_time " +
                std::string("     13.25       12.50        0.75        user\n") +
                "       phys_mem      20034       20000          34   anonymous\n"
                "      wired_mem         72          64           8      locked\n"
                " phys_footprint      20500       20000         500    resident\n"
                "       RESOURCE      TOTAL       FIRST      SECOND      MOSTLY  43 idle (user 1000)\n"
                "       cpu_time       0.00        0.00        0.00        none\n"
                "       phys_mem        134         100          34   anonymous\n"
                "      wired_mem          0           0           0        none\n"
                " phys_footprint        100         100           0    resident\n"
                "       RESOURCE      TOTAL       FIRST      SECOND      MOSTLY  total of 2 processes\n"
                "       cpu_time      13.25       12.50        0.75        user\n"
                "       phys_mem      20168       20100          68   anonymous\n"
                "      wired_mem         72          64           8      locked\n"
                " phys_footprint      20600       20100         500    resident\n"
                "       RESOURCE      TOTAL       FIRST      SECOND      MOSTLY");
}

TEST_F(MemoryUsageTest, TheMemoryLogKeepsEveryLineButThoseWithNothingWired) {
  addProcess(42, "pipewire", 20000, 500, 64, 8);
  addProcess(43, "idle", 100);
  const Run result = runHere();
  std::string expected;
  for (const std::string& line : result.lines()) {
    if (line.find("wired_mem          0 ") == std::string::npos) expected += "wiredlog: " + line + "\n";
  }
  EXPECT_EQ(MemoryLogTool::keptLines(result.out, MemoryLogTool::Filter::kMemoryLines), expected);
  EXPECT_THAT(expected, HasSubstr("wired_mem         72"));
  EXPECT_THAT(result.out, HasSubstr("wired_mem          0"));
}

TEST_F(MemoryUsageTest, TopLimitsTheProcessesNotTheTotals) {
  addProcess(42, "large", 20000);
  addProcess(43, "small", 100);
  const Run result = runHere({"--top", "1"});
  EXPECT_THAT(result.out, HasSubstr("42 large"));
  EXPECT_THAT(result.out, Not(HasSubstr("43 small")));
  EXPECT_THAT(result.out, HasSubstr("total of 2 processes"));
  EXPECT_THAT(runHere({"--top", "0"}).lines(), SizeIs(10));
}

TEST_F(MemoryUsageTest, JsonIsOneObjectALineForProcessesTotalAndSystem) {
  addProcess(42, "pipewire", 20000, 500, 64, 8, 1250, 75);
  const auto lines = runHere({"--json"}).lines();
  ASSERT_THAT(lines, SizeIs(3));
  EXPECT_EQ(nlohmann::json::parse(lines[0]), nlohmann::json::parse(R"({
    "pid": 42, "name": "pipewire", "user": 1000,
    "cpu_time": {"total": 13.25, "user": 12.5, "system": 0.75},
    "phys_mem": {"total": 20034, "anonymous": 20000, "shared": 34},
    "wired_mem": {"total": 72, "locked": 64, "pinned": 8},
    "phys_footprint": {"total": 20500, "resident": 20000, "swapped": 500}})"));
  const auto total = nlohmann::json::parse(lines[1]);
  EXPECT_EQ(total.at("total"), "processes");
  EXPECT_EQ(total.at("count"), 1);
  EXPECT_EQ(total.at("unreadable"), 0);
  const auto system = nlohmann::json::parse(lines[2]);
  EXPECT_EQ(system.at("total"), "system");
  EXPECT_EQ(system.at("wired_mem").at("kernel"), 123000);
}

TEST_F(MemoryUsageTest, WithoutADirectoryItFailsAndSaysSo) {
  const Run result = run({"--proc", "/nowhere"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, IsEmpty());
  EXPECT_EQ(result.err, "tw-memory-usage: /nowhere: No such file or directory\n");
}

TEST_F(MemoryUsageTest, ADirectoryThatIsNoProcFails) {
  TemporaryDirectory empty;
  const Run result = run({"--proc", empty.path().c_str()});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("/meminfo does not say how much memory there is"));
}

TEST_F(MemoryUsageTest, WrongUsageIsStatusTwo) {
  for (const auto& arguments : std::vector<std::vector<const char*>>{
           {"--sort", "beauty"}, {"--top", "-1"}, {"--top", "many"}, {"surplus"}, {"--unknown"}}) {
    const Run result = run(arguments);
    EXPECT_EQ(result.status, 2) << arguments[0];
    EXPECT_THAT(result.out, IsEmpty());
    EXPECT_THAT(result.err, Not(IsEmpty()));
  }
}

TEST_F(MemoryUsageTest, HelpAndVersionAreStatusZero) {
  const Run help = run({"--help"});
  EXPECT_EQ(help.status, 0);
  EXPECT_THAT(help.out, HasSubstr("phys_footprint"));
  const Run version = run({"--version"});
  EXPECT_EQ(version.status, 0);
  EXPECT_THAT(version.out, StartsWith("tw-memory-usage "));
}

TEST_F(MemoryUsageTest, AReportThatCannotBeWrittenIsAFailure) {
  std::ofstream full("/dev/full");
  std::ostringstream err;
  const std::vector<const char*> arguments{"tw-memory-usage", "--proc", directory.path().c_str()};
  EXPECT_EQ(runMemoryUsage(static_cast<int>(arguments.size()), arguments.data(), full, err), 1);
  EXPECT_EQ(err.str(), "tw-memory-usage: cannot write the report\n");
}

TEST_F(MemoryUsageTest, TheRealProcHoldsThisProcessAndASystem) {
  std::string problem;
  const auto snapshot = ProcReader("/proc", static_cast<double>(sysconf(_SC_CLK_TCK))).read(problem);
  ASSERT_TRUE(snapshot) << problem;
  const ProcessUsage* own = nullptr;
  for (const ProcessUsage& process : snapshot->processes) {
    if (process.process == getpid()) own = &process;
  }
  ASSERT_NE(own, nullptr);
  EXPECT_EQ(own->user, getuid());
  EXPECT_GT(own->usage.anonymous, 0U);
  EXPECT_GT(snapshot->system.anonymous, own->usage.anonymous);
  EXPECT_GT(snapshot->system.pinned, 0U);
  EXPECT_EQ(run({}).status, 0);
}

}  // namespace
}  // namespace tonewerk
