// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionSummaryWorker.h"

#include <gtest/gtest.h>
#include <limits>

#include "support/ReportingTest.h"
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::SizeIs;

class TWReportingSessionSummaryWorkerTest : public ReportingTest {
 protected:
  TWReportingSessionSummaryWorkerTest()
      : ReportingTest({&TWReportingSessionSummaryWorker::kWorkerClass,
                       &TWReportingSessionMetriconWorker::kWorkerClass}) {}

  void send(const ValueMap& payload, AudioEventCategory category = 4) {
    session->sendMessage(message(payload, category));
  }

  // Stops the session and returns its summary as the analytics worker got it.
  ValueMap summaryAtStop() {
    session->stop();
    const auto summaries = test.metricon.eventsNamed("com.orvane.tonewerk.Session_Generic.Summary");
    EXPECT_THAT(summaries, SizeIs(1));
    test.metricon.clear();
    return summaries.empty() ? ValueMap() : summaries.front();
  }

  std::shared_ptr<TWReportingSession> session = makeSession(77);
};

TEST_F(TWReportingSessionSummaryWorkerTest, TheSummaryHasAllKeysInOrder) {
  test.system.setThermalLevel(1);
  test.system.setLowPowerMode(true);
  test.system.setLoadAverages({0.5, 1.5, 2.5});
  test.processes.setFootprint(std::uint64_t{5} << 20);
  const ValueMap configuration{{"HostApplicationDisplayID", "com.orvane.player"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  session->setServiceType(7);
  session->setClientProcessName("player");
  session->start();
  send({{"session_duration", 2.0}});
  send({{"session_duration", 4.0}});
  send({{"issue_type", "overload"}});

  ValueMap summary = summaryAtStop();
  for (const char* added : {"invalid_timestamp", "twreporting_timestamp", "audiotag"}) summary.erase(added);
  EXPECT_EQ(
      summary.text(),
      R"({"total_active_time":6.0,"active_count":2,"overload_count":1,"average_active_time":3.0,)"
      R"("num_messages":3,"num_unique_messages":5,"num_redundant_messages":18446744073709551614,)"
      R"("singleMessageSession":false,"summaryServiceName":"longformaudio",)"
      R"("HostApplicationDisplayID":"com.orvane.player","clientProcessName":"player","thermal_state":"Fair",)"
      R"("low_power_enabled":1,"vmInfo_phys_footprint_MiB":5,"load_avg_1_min":0.5,"load_avg_5_min":1.5,)"
      R"("load_avg_15_min":2.5})");
}

// The device as it is now says nothing about the time of a session that a crash of the daemon has ended.
TEST_F(TWReportingSessionSummaryWorkerTest, ASummaryMadeInARecoveryLeavesOutHowTheDeviceIsNow) {
  RequestJournal& journal = context->journal();
  journal.play({});
  session->start();
  journal.endPlaying();
  const ValueMap summary = summaryAtStop();
  EXPECT_TRUE(summary.contains("num_messages"));
  for (const char* key : {"thermal_state", "low_power_enabled", "vmInfo_phys_footprint_MiB", "load_avg_1_min",
                          "load_avg_5_min", "load_avg_15_min"}) {
    EXPECT_FALSE(summary.contains(key)) << key;
  }
  journal.endRecovery();
  session->start();
  EXPECT_TRUE(summaryAtStop().contains("thermal_state"));
}

TEST_F(TWReportingSessionSummaryWorkerTest, WithoutDurationsNothingWasActive) {
  session->start();
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.number("average_active_time"), 0.0);
  EXPECT_EQ(summary.number("total_active_time"), 0.0);
  EXPECT_EQ(summary.integer("active_count"), 0);
}

TEST_F(TWReportingSessionSummaryWorkerTest, DurationsOfTwoAndFourSecondsAverageThree) {
  session->start();
  send({{"session_duration", 2.0}});
  send({{"session_duration", 4.0}});
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.number("total_active_time"), 6.0);
  EXPECT_EQ(summary.integer("active_count"), 2);
  EXPECT_EQ(summary.number("average_active_time"), 3.0);
}

TEST_F(TWReportingSessionSummaryWorkerTest, AMessageWithDurationAndOverloadCountsOnlyAsActivity) {
  session->start();
  send({{"session_duration", 2.0}, {"issue_type", "overload"}});
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.integer("active_count"), 1);
  EXPECT_EQ(summary.integer("overload_count"), 0);
}

TEST_F(TWReportingSessionSummaryWorkerTest, OnlyTheExactTextIsAnOverload) {
  session->start();
  send({{"issue_type", "Overload"}});
  send({{"issue_type", 1}});
  EXPECT_EQ(summaryAtStop().integer("overload_count"), 0);
}

TEST_F(TWReportingSessionSummaryWorkerTest, CountsReceivedAndStoredMessages) {
  session->start();
  for (const int n : {1, 1, 2, 2, 3}) send({{"n", n}});
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.integer("num_messages"), 5);
  EXPECT_EQ(summary.integer("num_unique_messages"), 5);  // three of the five, the start and the stop message
  EXPECT_EQ(*summary.find("num_redundant_messages")->asUnsigned(), 0U);
}

TEST_F(TWReportingSessionSummaryWorkerTest, TheRedundantCountWrapsWhenMoreAreStoredThanReceived) {
  session->start();
  EXPECT_EQ(*summaryAtStop().find("num_redundant_messages")->asUnsigned(),
            std::numeric_limits<std::uint64_t>::max() - 1);
}

TEST_F(TWReportingSessionSummaryWorkerTest, DerivedMessagesOfEarlierProducersCount) {
  useWorkers({&TWReportingSessionVolumeMessagesWorker::kWorkerClass,
              &TWReportingSessionSummaryWorker::kWorkerClass,
              &TWReportingSessionMetriconWorker::kWorkerClass});
  session = makeSession();
  session->start();
  const double now = test.clock.now();
  session->sendMessage(messageAt(now, {{"session_output_running", true}, {"QMSessionVolume", 0.5}}));
  session->sendMessage(messageAt(now + 5, {{"session_output_running", false}}));
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.integer("num_messages"), 3);
  EXPECT_EQ(summary.integer("num_unique_messages"), 5);
}

TEST_F(TWReportingSessionSummaryWorkerTest, TheTotalsContinueAfterAStop) {
  session->start();
  send({{"session_duration", 2.0}});
  EXPECT_EQ(summaryAtStop().integer("active_count"), 1);
  session->start();
  send({{"session_duration", 4.0}});
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.integer("active_count"), 2);
  EXPECT_EQ(summary.number("total_active_time"), 6.0);
}

TEST_F(TWReportingSessionSummaryWorkerTest, AnUnknownClientIsLeftOut) {
  session->start();
  EXPECT_FALSE(summaryAtStop().contains("clientProcessName"));
}

TEST_F(TWReportingSessionSummaryWorkerTest, NamesTheThermalLevelsAndCallsOthersUnknown) {
  for (const auto& [level, text] : std::vector<std::pair<int, std::string>>{
           {0, "Nominal"}, {1, "Fair"}, {2, "Serious"}, {3, "Critical"}, {4, "Unknown"}, {-1, "Unknown"}}) {
    test.system.setThermalLevel(level);
    session->start();
    EXPECT_EQ(summaryAtStop().text("thermal_state"), text);
  }
}

TEST_F(TWReportingSessionSummaryWorkerTest, LowPowerModeIsAnInteger) {
  session->start();
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.find("low_power_enabled")->kind(), Value::Kind::kInteger);
  EXPECT_EQ(summary.integer("low_power_enabled"), 0);
}

TEST_F(TWReportingSessionSummaryWorkerTest, AFootprintOfFourGiBWraps) {
  test.processes.setFootprint((std::uint64_t{4} << 30) + (std::uint64_t{3} << 20) + 5);
  session->start();
  EXPECT_EQ(summaryAtStop().integer("vmInfo_phys_footprint_MiB"), 3);
}

TEST_F(TWReportingSessionSummaryWorkerTest, AFootprintThatCannotBeReadIsLoggedAndLeftOut) {
  test.processes.failFootprint("no such process");
  session->start();
  EXPECT_FALSE(summaryAtStop().contains("vmInfo_phys_footprint_MiB"));
  EXPECT_THAT(test.log.textsOf("twru", LogLevel::kError),
              ElementsAre("Error with task_info(): no such process"));
}

TEST_F(TWReportingSessionSummaryWorkerTest, GetsItsOwnSummaryWithoutCountingIt) {
  session->start();
  summaryAtStop();
  session->start();
  const ValueMap summary = summaryAtStop();
  EXPECT_EQ(summary.integer("active_count"), 0);
  EXPECT_EQ(summary.integer("overload_count"), 0);
}

}  // namespace
}  // namespace tonewerk
