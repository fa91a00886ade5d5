// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/MemoryLogTool.h"

#include <string>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::Field;
using ::testing::SizeIs;
using Filter = MemoryLogTool::Filter;
using End = CommandRunner::End;

class MemoryLogToolTest : public ReportingTest {
 protected:
  std::string capture(CommandRunner::Result result, Filter filter = Filter::kNone) {
    test.commands.answer("tool", std::move(result));
    return MemoryLogTool("tool", filter).capture(test.commands);
  }
  std::vector<std::string> errors() const { return test.log.textsOf("twrr", LogLevel::kError); }
};

std::string kept(const std::string& output) { return MemoryLogTool::keptLines(output, Filter::kMemoryLines); }

TEST_F(MemoryLogToolTest, LogsWhatItRunsAndThatItHasCaptured) {
  EXPECT_EQ(capture({"one\ntwo\n"}), "one\ntwo\n");
  EXPECT_THAT(errors(), ElementsAre("wiredlog: requesting 'tool'", "wiredlog: request tool captured"));
}

TEST_F(MemoryLogToolTest, AToolThatCannotBeStartedIsLoggedAndGivesNothing) {
  EXPECT_EQ(MemoryLogTool("no such tool", Filter::kNone).capture(test.commands), "");
  EXPECT_THAT(errors(), ElementsAre("wiredlog: requesting 'no such tool'",
                                    "wiredlog: unable to execute 'no such tool'"));
}

TEST_F(MemoryLogToolTest, AToolMayTake4MebibytesAnd30Seconds) {
  capture({});
  ASSERT_THAT(test.commands.runs(), SizeIs(1));
  EXPECT_EQ(test.commands.runs()[0].limits.bytes, 4U * 1024 * 1024);
  EXPECT_EQ(test.commands.runs()[0].limits.time, std::chrono::seconds(30));
}

TEST_F(MemoryLogToolTest, AToolThatHangsIsLoggedAsStoppedAndItsOutputIsKept) {
  EXPECT_EQ(capture({"half a li", End::kTooLong}), "half a li");
  EXPECT_THAT(errors(),
              ElementsAre("wiredlog: requesting 'tool'", "wiredlog: 'tool' was stopped after 30 seconds",
                          "wiredlog: request tool captured"));
}

TEST_F(MemoryLogToolTest, AToolThatWritesTooMuchIsLoggedAsStopped) {
  EXPECT_EQ(capture({"y\ny\n", End::kTooMuch}), "y\ny\n");
  EXPECT_THAT(errors(),
              ElementsAre("wiredlog: requesting 'tool'", "wiredlog: 'tool' was stopped after 4194304 bytes",
                          "wiredlog: request tool captured"));
}

TEST_F(MemoryLogToolTest, AToolThatASignalEndsIsLogged) {
  EXPECT_EQ(capture({"x\n", End::kSignalled, 11}), "x\n");
  EXPECT_THAT(errors(), ElementsAre("wiredlog: requesting 'tool'", "wiredlog: 'tool' died of signal 11",
                                    "wiredlog: request tool captured"));
}

TEST_F(MemoryLogToolTest, AToolThatFailsIsLogged) {
  EXPECT_EQ(capture({"", End::kExited, 1}), "");
  EXPECT_THAT(errors(), ElementsAre("wiredlog: requesting 'tool'", "wiredlog: 'tool' failed with status 1",
                                    "wiredlog: request tool captured"));
}

TEST_F(MemoryLogToolTest, AFilteredToolsOutputIsFiltered) {
  EXPECT_EQ(capture({"noise\nRESOURCE x\n"}, Filter::kMemoryLines), "wiredlog: RESOURCE x\n");
}

TEST_F(MemoryLogToolTest, WithoutAFilterTheOutputIsKeptUnchanged) {
  const std::string output = "a\n\n" + std::string(5000, 'x') + "\nno end";
  EXPECT_EQ(MemoryLogTool::keptLines(output, Filter::kNone), output);
}

TEST_F(MemoryLogToolTest, LinesWithOneOfTheWordsAreKeptInOrderWithAPrefix) {
  EXPECT_EQ(kept("top - 10:00\n"
                 " cpu_time 1\n"
                 "a phys_mem 2\n"
                 " wired_mem 3\n"
                 " phys_footprint 4\n"
                 "RESOURCE\n"
                 "last\n"),
            "wiredlog:  cpu_time 1\n"
            "wiredlog: a phys_mem 2\n"
            "wiredlog:  wired_mem 3\n"
            "wiredlog:  phys_footprint 4\n"
            "wiredlog: RESOURCE\n");
}

TEST_F(MemoryLogToolTest, TheSpacesAroundAWordMustMatchToo) {
  EXPECT_EQ(kept("cpu_time 1\n cpu_time\n wired_memory 2\nphys_footprint\nresource\n"), "");
}

TEST_F(MemoryLogToolTest, ALineOfAllZeroWiredMemoryIsDropped) {
  EXPECT_EQ(kept("  wired_mem          0           0           0        none\n"), "");
  EXPECT_EQ(kept("  wired_mem          0           4           0        none\n"),
            "wiredlog:   wired_mem          0           4           0        none\n");
}

TEST_F(MemoryLogToolTest, AnAllZeroLineThatAnEarlierWordMatchesIsKept) {
  const std::string line = " cpu_time 1 wired_mem          0           0           0        none\n";
  EXPECT_EQ(kept(line), "wiredlog: " + line);
}

TEST_F(MemoryLogToolTest, AnAllZeroLineThatOnlyALaterWordMatchesIsKept) {
  const std::string line = "RESOURCE:wired_mem          0           0           0        none\n";
  EXPECT_EQ(kept(line), "wiredlog: " + line);
}

TEST_F(MemoryLogToolTest, ALineWithResourceIsKeptWithThePrefix) {
  EXPECT_EQ(kept("  RESOURCE  TOTAL\n"), "wiredlog:   RESOURCE  TOTAL\n");
}

TEST_F(MemoryLogToolTest, ALastLineWithoutAnEndIsALine) {
  EXPECT_EQ(kept("noise\nRESOURCE"), "wiredlog: RESOURCE");
}

TEST_F(MemoryLogToolTest, ALineOfMoreThan2048BytesCountsAsSeveral) {
  const std::string exactly = "RESOURCE" + std::string(2048 - 8 - 1, 'x') + "\n";
  EXPECT_EQ(kept(exactly + "noise\n"), "wiredlog: " + exactly);
  const std::string longer = "RESOURCE" + std::string(2048 - 8, 'x') + "yyy\nRESOURCE\n";
  EXPECT_EQ(kept(longer), "wiredlog: " + longer.substr(0, 2048) + "wiredlog: RESOURCE\n");
}

}  // namespace
}  // namespace tonewerk
