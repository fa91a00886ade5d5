// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionMemoryLogWorker.h"

#include <algorithm>
#include <chrono>
#include <future>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/Heartbeat.h"
#include "platform/accounts/WorkingFor.h"
#include "support/ReportingTest.h"
#include "workers/diagnostics/MemoryLogTool.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;
using ::testing::UnorderedElementsAre;

constexpr AudioEventType kMemoryLog = 19;
constexpr std::string_view kDomain = "com.orvane.tonewerk.twreporting";

class TWReportingSessionMemoryLogWorkerTest : public ReportingTest {
 protected:
  TWReportingSessionMemoryLogWorkerTest()
      : ReportingTest({&TWReportingSessionMemoryLogWorker::kWorkerClass}) {
    test.commands.answer("tw-memory-usage", "RESOURCE of all\nnoise\n");
    test.commands.answer("slabtop --once", "slabs\n");
  }

  bool handle(AudioEventType type = kMemoryLog) {
    return worker.handleMessage(TWReportingSessionMessage(ValueMap(), 1, type));
  }
  // Handles a message as a piece of the work queue, which another thread runs.
  std::future<bool> handleOnAnotherThread() {
    SerialQueue& queue = context->reportingServerQueue();
    return std::async(std::launch::async, [this, &queue] {
      bool result = true;
      queue.async([&] { result = handle(); });
      queue.drain();
      return result;
    });
  }
  // Returns the commands run so far, sorted.
  std::vector<std::string> commands() const {
    std::vector<std::string> commands;
    for (const auto& run : test.commands.runs()) commands.push_back(run.command);
    std::sort(commands.begin(), commands.end());
    return commands;
  }
  std::vector<std::string> errors() const { return test.log.textsOf("twrr", LogLevel::kError); }
  std::vector<std::string> blocks() const {
    std::vector<std::string> blocks;
    for (const std::string& line : errors()) {
      if (line.starts_with("WIRED LOG BLOCK ")) blocks.push_back(line);
    }
    return blocks;
  }
  std::vector<std::string> blocksOf(const std::string& text) {
    test.log.clear();
    TWReportingSessionMemoryLogWorker::writeBlocks(text);
    return errors();
  }

  TWReportingSessionMemoryLogWorker worker;
};

TEST_F(TWReportingSessionMemoryLogWorkerTest, IsAConsumerFromTheSessionsCreationAlsoOfRedundantMessages) {
  const auto& workerClass = TWReportingSessionMemoryLogWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_TRUE(workerClass.startOnInit);
  EXPECT_FALSE(workerClass.handleSingleMessageSession);
  EXPECT_TRUE(worker.handleRedundantMessages());
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, OnInternalBuildsEverySessionHasOneFromItsCreation) {
  makeInternalBuild();
  EXPECT_EQ(makeSession()->workerInstanceCount(), 1U);
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, ElsewhereTestSessionsHaveOneFromTheirStart) {
  const auto session = makeSession();
  session->setServiceType(kServiceTest);
  EXPECT_EQ(session->workerInstanceCount(), 0U);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 1U);
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, ElsewhereOtherSessionsHaveNone) {
  const auto session = makeSession();
  session->setServiceType(kServiceStandalone);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, AMemoryLogMessageLogsTheOutputOfBothToolsTheSecondFirst) {
  EXPECT_FALSE(handle());
  EXPECT_THAT(errors(),
              UnorderedElementsAre(
                  "wiredlog: requesting 'slabtop --once'", "wiredlog: request slabtop --once captured",
                  "wiredlog: requesting 'tw-memory-usage'", "wiredlog: request tw-memory-usage captured",
                  "WIRED LOG BLOCK 1\nslabs\n", "WIRED LOG BLOCK 1\nwiredlog: RESOURCE of all\n"));
  EXPECT_THAT(blocks(),
              ElementsAre("WIRED LOG BLOCK 1\nslabs\n", "WIRED LOG BLOCK 1\nwiredlog: RESOURCE of all\n"));
  EXPECT_THAT(test.log.lines(), SizeIs(6));  // all of them errors
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, MessagesOfOtherTypesDoNothingAndDoNotUseTheLimit) {
  for (const int type : {0, 6, 18, 20, 65535}) EXPECT_FALSE(handle(static_cast<AudioEventType>(type)));
  EXPECT_THAT(commands(), IsEmpty());
  handle();
  EXPECT_THAT(commands(), SizeIs(2));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest,
       AMessageOfAUserWhoIsNotTrustedLogsNothingAndDoesNotUseTheLimit) {
  const auto user = test.accounts.of(1001);
  {
    const WorkingFor scope(user);
    EXPECT_FALSE(handle());
  }
  EXPECT_THAT(commands(), IsEmpty());
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("no memory log for user 1001, who is not trusted")));
  const WorkingFor scope(test.accounts.own());
  EXPECT_FALSE(handle());
  EXPECT_THAT(commands(), SizeIs(2));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, TheVeryFirstRequestPasses) {
  ASSERT_EQ(test.clock.monotonic().count(), 0);
  handle();
  EXPECT_THAT(commands(), SizeIs(2));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, TwoMessagesThreeSecondsApartCaptureOnceSixTwice) {
  handle();
  test.clock.advance(3.0);
  handle();
  EXPECT_THAT(commands(), SizeIs(2));
  test.clock.advance(3.0);
  handle();
  EXPECT_THAT(commands(), SizeIs(4));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, ExactlyFiveSecondsLaterIsTooEarly) {
  handle();
  test.clock.advance(std::chrono::seconds(5));
  handle();
  EXPECT_THAT(commands(), SizeIs(2));
  test.clock.advance(std::chrono::nanoseconds(1));
  handle();
  EXPECT_THAT(commands(), SizeIs(4));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, AMessageThatComesTooEarlyDoesNotDelayTheNextOne) {
  handle();
  test.clock.advance(4.0);
  handle();
  test.clock.advance(2.0);
  handle();
  EXPECT_THAT(commands(), SizeIs(4));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, TheLimitHoldsForAllSessionsTogether) {
  makeInternalBuild();
  const auto one = makeSession(77);
  const auto other = makeSession(78);
  one->sendMessage(message({{"a", 1}}, 1, kMemoryLog));
  test.clock.advance(3.0);
  other->sendMessage(message({{"a", 1}}, 1, kMemoryLog));
  EXPECT_THAT(commands(), SizeIs(2));
  test.clock.advance(3.0);
  other->sendMessage(message({{"a", 1}}, 1, kMemoryLog));  // redundant, but the worker handles it
  EXPECT_THAT(commands(), SizeIs(4));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, AJumpOfTheWallClockChangesNothing) {
  handle();
  test.clock.setNow(0.0);
  handle();
  test.clock.setNow(5e9);
  handle();
  EXPECT_THAT(commands(), SizeIs(2));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, TheSecondToolStartsFirstEachOnAThreadOfItsOwn) {
  handle();
  EXPECT_THAT(test.threads.started(), ElementsAre("twr-memory-1", "twr-memory-0"));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, BothToolsRunAtOnceAndTheHandlerWaitsForBoth) {
  test.commands.hold("slabtop --once");
  test.commands.hold("tw-memory-usage");
  auto handled = handleOnAnotherThread();
  test.commands.waitForRuns(2);  // neither waits for the other
  test.commands.release("tw-memory-usage");
  EXPECT_THAT(blocks(), IsEmpty());  // the second tool's output must come first
  EXPECT_NE(handled.wait_for(std::chrono::seconds(0)), std::future_status::ready);
  test.commands.release("slabtop --once");
  EXPECT_FALSE(handled.get());
  EXPECT_THAT(blocks(), SizeIs(2));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, TheLimiterIsNotLockedWhileTheToolsRun) {
  test.commands.hold("slabtop --once");
  auto handled = handleOnAnotherThread();
  test.commands.waitForRuns(2);
  EXPECT_FALSE(handle());  // would never return if the limiter stayed locked
  test.commands.release("slabtop --once");
  handled.get();
  EXPECT_THAT(commands(), SizeIs(2));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, AToolThatCannotBeStartedIsLoggedAndHasNoBlocks) {
  test.preferences.configure(kDomain, "memory_tools", ValueArray{"/nowhere/tool", "slabtop --once"});
  handle();
  EXPECT_THAT(errors(), Contains("wiredlog: unable to execute '/nowhere/tool'"));
  EXPECT_THAT(errors(), Not(Contains(HasSubstr("request /nowhere/tool captured"))));
  EXPECT_THAT(blocks(), ElementsAre("WIRED LOG BLOCK 1\nslabs\n"));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, APreferenceNamesOtherToolsTheFirstOfWhichIsFiltered) {
  test.preferences.configure(kDomain, "memory_tools", ValueArray{"one", "two -x"});
  test.commands.answer("one", "noise\n wired_mem 1\n");
  test.commands.answer("two -x", "noise\n");
  handle();
  EXPECT_THAT(commands(), ElementsAre("one", "two -x"));
  EXPECT_THAT(blocks(),
              ElementsAre("WIRED LOG BLOCK 1\nnoise\n", "WIRED LOG BLOCK 1\nwiredlog:  wired_mem 1\n"));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, APreferenceThatDoesNotNameTwoToolsIsLoggedAndIgnored) {
  const std::vector<Value> wrong{"one", ValueArray{"one"}, ValueArray{"one", "two", "three"},
                                 ValueArray{"one", 2}, ValueArray{1, "two"}};
  for (const Value& value : wrong) {
    test.preferences.configure(kDomain, "memory_tools", value);
    test.log.clear();
    handle();
    EXPECT_THAT(errors(), Contains("memory_tools is not an array of two texts: " + value.text()));
    EXPECT_THAT(blocks(), SizeIs(2));
    test.clock.advance(6.0);
  }
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, WithoutAThreadForTheToolThatStartsFirstNothingIsRun) {
  test.threads.refuse("twr-memory-1", std::errc::resource_unavailable_try_again);
  EXPECT_FALSE(handle());
  EXPECT_THAT(errors(),
              ElementsAre("no memory log: thread constructor failed: Resource temporarily unavailable"));
  EXPECT_THAT(commands(), IsEmpty());
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, WithoutAThreadForTheOtherToolItWaitsForTheRunningOne) {
  test.threads.refuse("twr-memory-0", std::errc::resource_unavailable_try_again);
  EXPECT_FALSE(handle());
  EXPECT_THAT(
      errors(),
      ElementsAre("wiredlog: requesting 'slabtop --once'", "wiredlog: request slabtop --once captured",
                  "no memory log: thread constructor failed: Resource temporarily unavailable"));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, AnEmptyTextIsNoBlock) { EXPECT_THAT(blocksOf(""), IsEmpty()); }

TEST_F(TWReportingSessionMemoryLogWorkerTest, FifteenHundredBytesInLinesOfAHundredEndOnLines) {
  std::string text;
  for (int line = 0; line < 15; ++line) text += std::string(99, static_cast<char>('a' + line)) + "\n";
  // The first line end at or after byte 512 is byte 599.
  EXPECT_THAT(blocksOf(text), ElementsAre("WIRED LOG BLOCK 1\n" + text.substr(0, 600),
                                          "WIRED LOG BLOCK 2\n" + text.substr(600, 600),
                                          "WIRED LOG BLOCK 3\n" + text.substr(1200)));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, ALineEndAtByte512IsTheBlocksEnd) {
  const std::string text = std::string(512, 'x') + "\nrest";
  EXPECT_THAT(blocksOf(text),
              ElementsAre("WIRED LOG BLOCK 1\n" + text.substr(0, 513), "WIRED LOG BLOCK 2\nrest"));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, ALineEndBeforeByte512IsNotTheBlocksEnd) {
  const std::string text = std::string(511, 'x') + "\n" + std::string(100, 'y') + "\nz";
  EXPECT_THAT(blocksOf(text),
              ElementsAre("WIRED LOG BLOCK 1\n" + text.substr(0, 613), "WIRED LOG BLOCK 2\nz"));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, WithoutALineEndABlockIsExactly512Bytes) {
  const std::string text(1100, 'x');
  EXPECT_THAT(blocksOf(text), ElementsAre("WIRED LOG BLOCK 1\n" + text.substr(0, 512),
                                          "WIRED LOG BLOCK 2\n" + text.substr(0, 512),
                                          "WIRED LOG BLOCK 3\n" + text.substr(0, 76)));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, AfterTheLastLineEndBlocksAreExactly512BytesAgain) {
  const std::string lines = std::string(99, 'x') + "\n" + std::string(599, 'y') + "\n";
  const std::string rest(1100, 'z');
  EXPECT_THAT(
      blocksOf(lines + rest),
      ElementsAre("WIRED LOG BLOCK 1\n" + lines, "WIRED LOG BLOCK 2\n" + rest.substr(0, 512),
                  "WIRED LOG BLOCK 3\n" + rest.substr(0, 512), "WIRED LOG BLOCK 4\n" + rest.substr(0, 76)));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, LessThan512BytesAreOneBlock) {
  const std::string text = std::string(100, 'x') + "\n" + std::string(410, 'y');
  ASSERT_EQ(text.size(), 511U);
  EXPECT_THAT(blocksOf(text), ElementsAre("WIRED LOG BLOCK 1\n" + text));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, Exactly512BytesAreOneBlock) {
  const std::string text(512, 'x');
  EXPECT_THAT(blocksOf(text), ElementsAre("WIRED LOG BLOCK 1\n" + text));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, LogLinesNameTheirSource) {
  handle();
  for (const auto& line : test.log.linesOf("twrr")) {
    EXPECT_THAT(line.message, ::testing::AnyOf(StartsWith("TWReportingSessionMemoryLogWorker:"),
                                               HasSubstr("MemoryLogTool:")));
  }
}

// Disables its first line and writes all later ones.
class LateLog final : public Log {
 public:
  bool isEnabled(std::string_view, LogLevel) const override { return std::exchange(isEnabled_, true); }
  void write(std::string_view, std::string_view, LogLevel, std::string_view message) override {
    lines.push_back(MemoryLog::withoutPrefix(message));
  }
  std::vector<std::string> lines;

 private:
  mutable bool isEnabled_ = false;
};

TEST(MemoryLogNumbering, ABlockThatIsNotWrittenHasNoNumber) {
  TestPlatform test;
  LateLog log;
  const TWReportingContext context(
      test.platformWith(log, test.tracePoints, test.clock, test.queues, test.metricon, test.linkReport), {});
  TWReportingSessionMemoryLogWorker::writeBlocks(std::string(512, 'a') + std::string(512, 'b') +
                                                 std::string(512, 'c'));
  EXPECT_THAT(log.lines, ElementsAre("WIRED LOG BLOCK 1\n" + std::string(512, 'b'),
                                     "WIRED LOG BLOCK 2\n" + std::string(512, 'c')));
}

TEST_F(TWReportingSessionMemoryLogWorkerTest, WaitingForTheToolsIsLongWorkOfTheirTime) {
  const auto heartbeat = std::make_shared<Heartbeat>();
  test.commands.hold("slabtop --once");
  auto handled = std::async(std::launch::async, [&] {
    const Heartbeat::OnThisThread scope(heartbeat);
    SerialQueue& queue = context->reportingServerQueue();
    queue.async([&] { handle(); });
    queue.drain();
  });
  test.commands.waitForRuns(2);
  EXPECT_EQ(heartbeat->read().allowance, MemoryLogTool::kLimits.time);
  test.commands.release("slabtop --once");
  handled.get();
  EXPECT_EQ(heartbeat->read().allowance, std::chrono::seconds(0));
}

}  // namespace
}  // namespace tonewerk
