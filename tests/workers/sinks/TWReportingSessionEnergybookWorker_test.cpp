// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionEnergybookWorker.h"

#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr AudioEventType kEnergybook = 8;

class TWReportingSessionEnergybookWorkerTest : public ReportingTest {
 protected:
  void nameApplication(const Value& name) {
    const ValueMap configuration{{"HostApplicationDisplayID", name}};
    EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  }
  bool handle(const ValueMap& payload, AudioEventType type = kEnergybook) {
    return worker.handleMessage(TWReportingSessionMessage(payload, 1, type));
  }
  // The events that were sent, each as "group name payload".
  std::vector<std::string> sent() const {
    std::vector<std::string> texts;
    for (const auto& event : test.energybook.events()) {
      texts.push_back(std::to_string(event.group) + " " + event.name + " " + event.payload.text());
    }
    return texts;
  }
  std::vector<std::string> errors() const { return test.log.textsOf("twrp", LogLevel::kError); }

  std::shared_ptr<TWReportingSession> session = makeSession();
  TWReportingSessionEnergybookWorker worker{session};
};

TEST_F(TWReportingSessionEnergybookWorkerTest,
       IsAConsumerFromTheSessionsCreationAlsoInSingleMessageSessions) {
  const auto& workerClass = TWReportingSessionEnergybookWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_TRUE(workerClass.startOnInit);
  EXPECT_TRUE(workerClass.handleSingleMessageSession);
  EXPECT_FALSE(worker.handleRedundantMessages());
}

TEST_F(TWReportingSessionEnergybookWorkerTest, SendsHowLongTheEngineWasOn) {
  nameApplication("com.orvane.game");
  EXPECT_FALSE(handle({{"EngineOnTime", 12.5}, {"twreporting_timestamp", 100.0}, {"other", 1}}));
  EXPECT_THAT(sent(), ElementsAre(R"(28 Flumen_Haptics_EngineOnDuration {"EngineOnDuration":12.5,)"
                                  R"("ApplicationName":"com.orvane.game","TimestampEnd":100.0})"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionEnergybookWorkerTest, TheDurationIsPassedOnAsItIs) {
  nameApplication("com.orvane.game");
  handle({{"EngineOnTime", ValueMap{{"a", ValueArray{1}}}}, {"twreporting_timestamp", 100.0}});
  ASSERT_THAT(test.energybook.events(), SizeIs(1));
  EXPECT_EQ(*test.energybook.events()[0].payload.find("EngineOnDuration"),
            Value(ValueMap{{"a", ValueArray{1}}}));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, ADurationWithoutAnApplicationIsSentAndTheLackIsLogged) {
  handle({{"EngineOnTime", 3}, {"twreporting_timestamp", 100.0}});
  EXPECT_THAT(sent(), ElementsAre(R"(28 Flumen_Haptics_EngineOnDuration {"EngineOnDuration":3,)"
                                  R"("TimestampEnd":100.0})"));
  EXPECT_THAT(errors(), ElementsAre("failed to get app name for energybook"));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, ADurationOfAnApplicationCalledUnknownIsSentWithoutIt) {
  nameApplication("Unknown");
  handle({{"EngineOnTime", 3}, {"twreporting_timestamp", 100.0}});
  EXPECT_FALSE(test.energybook.events().at(0).payload.contains("ApplicationName"));
  EXPECT_THAT(errors(), ElementsAre("failed to get app name for energybook"));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, ADurationWithoutATimeIsSentAndTheLackIsLogged) {
  nameApplication("com.orvane.game");
  handle({{"EngineOnTime", 3}});
  EXPECT_THAT(sent(), ElementsAre(R"(28 Flumen_Haptics_EngineOnDuration {"EngineOnDuration":3,)"
                                  R"("ApplicationName":"com.orvane.game"})"));
  EXPECT_THAT(errors(), ElementsAre("failed to get TWReporting timestamp for energybook"));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, LogLinesCarryTheWorkersName) {
  handle({{"EngineOnTime", 3}});
  const auto lines = test.log.linesOf("twrp", LogLevel::kError);
  ASSERT_THAT(lines, SizeIs(2));
  for (const auto& line : lines) {
    EXPECT_THAT(line.message, StartsWith("TWReportingSessionEnergybookWorker:"));
  }
}

TEST_F(TWReportingSessionEnergybookWorkerTest, SendsThatTheEngineIsOn) {
  nameApplication("com.orvane.game");
  EXPECT_FALSE(handle({{"EngineState", "EngineOn"}, {"twreporting_timestamp", 100.0}}));
  EXPECT_THAT(sent(), ElementsAre(R"(28 Flumen_Haptics_ClientStatus {"Status":true,)"
                                  R"("ApplicationName":"com.orvane.game","TimestampEnd":100.0})"));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, EveryOtherStateIsOff) {
  for (const Value& state : {Value("EngineOff"), Value("engineon"), Value("EngineOn "), Value(""),
                             Value(true), Value(1), Value(ValueArray{"EngineOn"})}) {
    handle({{"EngineState", state}});
    EXPECT_EQ(*test.energybook.events().back().payload.find("Status"), Value(false)) << state.text();
  }
  EXPECT_THAT(test.energybook.events(), SizeIs(7));
}

TEST_F(TWReportingSessionEnergybookWorkerTest,
       AStatusWithoutApplicationAndTimeIsSentAsUnknownAndNothingIsLogged) {
  handle({{"EngineState", "EngineOn"}});
  EXPECT_THAT(sent(), ElementsAre(R"(28 Flumen_Haptics_ClientStatus {"Status":true,)"
                                  R"("ApplicationName":"Unknown"})"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionEnergybookWorkerTest, SendsASessionThatKeepsTheEngineOnTooLong) {
  nameApplication("com.orvane.game");
  EXPECT_FALSE(handle({{"Haptic_Active_Hardware_Time_Seconds", 3600},
                       {"Active_Clients", ValueArray{"a", "b"}},
                       {"twreporting_timestamp", 100.0}}));
  EXPECT_THAT(sent(),
              ElementsAre(R"(28 LeakedHapticsSessionInfo {"Haptic_Active_Hardware_Time_Seconds":3600,)"
                          R"("Active_Clients":["a","b"]})"));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, ALongSessionWithoutClientsIsSentWithoutThem) {
  handle({{"Haptic_Active_Hardware_Time_Seconds", 3600}});
  EXPECT_THAT(sent(),
              ElementsAre(R"(28 LeakedHapticsSessionInfo {"Haptic_Active_Hardware_Time_Seconds":3600})"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionEnergybookWorkerTest, AMessageThatReportsAllThreeSendsThreeInOrder) {
  handle({{"Haptic_Active_Hardware_Time_Seconds", 3600}, {"EngineState", "EngineOff"}, {"EngineOnTime", 3}});
  EXPECT_THAT(sent(), ElementsAre(StartsWith("28 Flumen_Haptics_EngineOnDuration "),
                                  StartsWith("28 Flumen_Haptics_ClientStatus "),
                                  StartsWith("28 LeakedHapticsSessionInfo ")));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, AMessageThatReportsNoneOfThemSendsNothing) {
  EXPECT_FALSE(handle({{"Active_Clients", 2}, {"twreporting_timestamp", 100.0}}));
  EXPECT_THAT(sent(), IsEmpty());
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionEnergybookWorkerTest, AMessageOfAnotherTypeSendsNothing) {
  for (const int type : {0, 1, 7, 9, 19, 65535}) {
    EXPECT_FALSE(
        handle({{"EngineOnTime", 3}, {"EngineState", "EngineOn"}}, static_cast<AudioEventType>(type)));
  }
  EXPECT_THAT(sent(), IsEmpty());
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionEnergybookWorkerTest, AfterTheSessionsEndTheApplicationIsUnknown) {
  nameApplication("com.orvane.game");
  session.reset();
  handle({{"EngineOnTime", 3}, {"EngineState", "EngineOn"}});
  EXPECT_THAT(sent(), ElementsAre(R"(28 Flumen_Haptics_EngineOnDuration {"EngineOnDuration":3})",
                                  R"(28 Flumen_Haptics_ClientStatus {"Status":true,)"
                                  R"("ApplicationName":"Unknown"})"));
}

TEST_F(TWReportingSessionEnergybookWorkerTest, GetsASessionsMessagesBeforeItsStart) {
  session.reset();
  useWorkers({&TWReportingSessionEnergybookWorker::kWorkerClass});
  session = makeSession();
  session->sendMessage(message({{"EngineState", "EngineOn"}}, 1, kEnergybook));
  EXPECT_THAT(sent(), ElementsAre(StartsWith(R"(28 Flumen_Haptics_ClientStatus {"Status":true,)"
                                             R"("ApplicationName":"Unknown","TimestampEnd":)")));
}

}  // namespace
}  // namespace tonewerk
