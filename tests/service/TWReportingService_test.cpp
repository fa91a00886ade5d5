// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingService.h"

#include <gtest/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "monitor/TWReportingSystemMonitor.h"
#include "service/TWReportingClientServerInstance.h"
#include "support/ServiceTest.h"

namespace tonewerk {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

const std::optional<std::vector<ReporterID>> kNoIDs;

class TWReportingServiceTest : public ServiceTest {
 protected:
  std::vector<ReporterID> identifiersFoundFor(const std::optional<std::vector<ReporterID>>& identifiers) {
    std::vector<ReporterID> found;
    for (const auto& session : service->findReportingSessionsForIDs(identifiers, owner()))
      found.push_back(session->reporterID());
    return found;
  }
};

// Clients.

TEST_F(TWReportingServiceTest, ListsClientsInOrderOfConnectionWithTheirNamesAndStartDates) {
  test.processes.setName(11, "player");
  const auto first = connect(11);
  const auto second = connect(12);
  run();
  ASSERT_THAT(service->getAllClients(), SizeIs(2));
  EXPECT_EQ(service->getAllClients()[0]->processIdentifier(), 11);
  EXPECT_EQ(service->getAllClients()[0]->clientProcessName(), "player");
  EXPECT_EQ(service->getAllClients()[0]->clientStartDate(), test.clock.now());
  EXPECT_EQ(service->getAllClients()[1]->processIdentifier(), 12);
  EXPECT_EQ(service->getAllClients()[1]->clientProcessName(), std::nullopt);
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo), Contains(StartsWith("newConnection: ")));
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo), Contains("new client with pid 11"));
}

TEST_F(TWReportingServiceTest, AClientThatLeavesIsRemovedOnceAlthoughTwoHandlersRun) {
  auto client = connect(11);
  run();
  client->disconnect();
  run();
  EXPECT_THAT(service->getAllClients(), IsEmpty());
  const auto lines = test.log.textsOf("twrs", LogLevel::kInfo);
  EXPECT_THAT(lines, Contains("interruptionHandler: connection exited"));
  EXPECT_THAT(lines, Contains("removing 11 from the server client list").Times(1));
  EXPECT_THAT(lines, Contains("dealloc 11 from the server client list").Times(1));
}

TEST_F(TWReportingServiceTest, ALostClientsStartedSessionsStopAndReport) {
  auto client = connect(11);
  start(*client, 77);
  const auto started = sessionOf(0, 77);
  create(*client, 78);
  const auto unstarted = sessionOf(0, 78);
  client->disconnect();
  run();
  EXPECT_FALSE(started->started());
  EXPECT_THAT(started->messages(), IsEmpty());
  EXPECT_THAT(unstarted->messages(), IsEmpty());  // not stopped: no stop message
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug), Contains("ending session. reporterID=77"));
}

TEST_F(TWReportingServiceTest, ALostClientsStartIsNotAnswered) {
  auto client = connect(11);
  create(*client, 77);
  const auto identifier = client->request("startReportingSessionForID", {77});
  run();
  client->disconnect();
  run();
  EXPECT_EQ(client->responseTo(identifier), std::nullopt);
}

TEST_F(TWReportingServiceTest, ReportsHowLongAClientWasConnected) {
  test.processes.setName(11, "player");
  auto client = connect(11);
  run();
  test.clock.advance(12.75);
  client->disconnect();
  const auto events = test.metricon.eventsNamed("com.orvane.tonewerk.twreportingclientuptime");
  ASSERT_THAT(events, SizeIs(1));
  EXPECT_EQ(events[0].text(), R"({"processName":"player","seconds":12.75})");
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo),
              Contains("invalidationHandler: connection exited process=player uptime_sec=12"));
}

TEST_F(TWReportingServiceTest, AClientThatWasNeverRegisteredHasNoStartDateAndMinusOneSeconds) {
  auto client = connect(11);
  client->disconnect();  // before the work queue registers it
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo),
              AllOf(Contains("clientStartDate is nil. clientpid=11 clientprocessname=unknown"),
                    Contains("clientProcessName is nil. clientpid=11"),
                    Contains("invalidationHandler: connection exited process=(null) uptime_sec=-1")));
  EXPECT_THAT(test.log.textsAt(LogLevel::kError), IsEmpty());
  EXPECT_THAT(test.metricon.events(), IsEmpty());
  run();
  EXPECT_THAT(service->getAllClients(), IsEmpty());
}

TEST_F(TWReportingServiceTest, AStartDateInTheFutureIsLoggedAndTheDifferenceIsReported) {
  test.processes.setName(11, "player");
  auto client = connect(11);
  run();
  test.clock.setNow(test.clock.now() - 100);
  client->disconnect();
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kError),
              ElementsAre("clientStartDate is in the past. clientpid=11 clientprocessname=player"));
  EXPECT_EQ(test.metricon.eventsNamed("com.orvane.tonewerk.twreportingclientuptime").at(0).number("seconds"),
            100.0);
}

// Each use of a tool that lists the sessions once caused an event of its own.
TEST_F(TWReportingServiceTest, ReportsNothingForAnOnlookerAndLogsItsEndForDebuggingOnly) {
  test.processes.setName(11, "twctl");
  auto client = connect(11);
  EXPECT_EQ(askOnce(*client, "observe", {}), Value(true));
  EXPECT_EQ(askOnce(*client, "getAllReporters", {}), Value(ValueArray()));
  test.log.clear();
  client->disconnect();
  run();
  EXPECT_THAT(test.metricon.events(), IsEmpty());
  EXPECT_THAT(service->getAllClients(), IsEmpty());
  for (const LogLevel level : {LogLevel::kInfo, LogLevel::kDefault, LogLevel::kError}) {
    EXPECT_THAT(test.log.textsOf("twrs", level), IsEmpty());
  }
  EXPECT_THAT(
      test.log.textsOf("twrs", LogLevel::kDebug),
      ElementsAre("interruptionHandler: connection exited", "onlooker 11 has gone",
                  "removing 11 from the server client list", "dealloc 11 from the server client list"));
}

TEST_F(TWReportingServiceTest, AnOnlookerMayAskButChangeNothing) {
  const auto client = connect(11);
  start(*client, 77);
  const auto onlooker = connect(12);
  EXPECT_EQ(askOnce(*onlooker, "observe", {}), Value(true));
  EXPECT_EQ(askOnce(*onlooker, "observe", {}), Value(true));
  const std::vector<std::pair<std::string, Arguments>> changes{
      {"createReportingSession", {78}},
      {"setServiceType", {7, 77}},
      {"setConfiguration", {ValueMap{{"a", 1}}, 77}},
      {"startReportingSessionForID", {77}},
      {"sendMessage", {ValueMap{{"a", 1}}, 4, 1, ValueArray{77}}},
      {"stopReportingSessionForID", {77}},
      {"destroyReportingSession", {77}},
      {"killService", {}}};
  for (const auto& [method, arguments] : changes) {
    SCOPED_TRACE(method);
    const auto answers = ask(*onlooker, method, arguments);
    ASSERT_THAT(answers, SizeIs(1));
    EXPECT_EQ(answers[0].error,
              messagingError(4, "not permitted: the connection only looks on since observe, and " + method +
                                    " changes something"));
  }
  EXPECT_EQ(processEnds, 0);
  EXPECT_THAT(sessionOf(0, 77)->messages(), SizeIs(1));  // the start message
  EXPECT_EQ(askOnce(*onlooker, "getAllReporters", {}), Value(ValueArray{77}));
  EXPECT_EQ(askOnce(*onlooker, "reporterIDValid", {77}).asMap()->integer("reporterID"), 77);
  EXPECT_EQ(askOnce(*onlooker, "watch.sessions", {0}).asMap()->integer("total"), 1);
}

TEST_F(TWReportingServiceTest, AConnectionThatChangedSomethingStaysAClient) {
  test.processes.setName(11, "player");
  auto client = connect(11);
  EXPECT_EQ(askOnce(*client, "getAllReporters", {}), Value(ValueArray()));
  create(*client, 77);
  const auto answers = ask(*client, "observe", {});
  ASSERT_THAT(answers, SizeIs(1));
  EXPECT_EQ(answers[0].error,
            messagingError(4, "not permitted: observe comes before what changes something"));
  client->disconnect();
  EXPECT_THAT(test.metricon.eventsNamed("com.orvane.tonewerk.twreportingclientuptime"), SizeIs(1));
}

TEST_F(TWReportingServiceTest, LogsItsEnd) {
  service.reset();
  EXPECT_THAT(test.log.textsOf("twrc", LogLevel::kInfo), ElementsAre("destroying service"));
}

// Finding one session.

TEST_F(TWReportingServiceTest, FindsASessionOfAnyClient) {
  const auto first = connect(11);
  const auto second = connect(12);
  create(*second, 78);
  EXPECT_EQ(service->findReportingSessionForID(78, *owner()), sessionOf(1, 78));
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo),
              Contains("found reporting session 78 for client 12"));
}

TEST_F(TWReportingServiceTest, AnIdentifierOfTwoClientsFindsTheSessionOfTheFirstConnected) {
  const auto first = connect(11);
  const auto second = connect(12);
  create(*second, 77);
  create(*first, 77);
  EXPECT_EQ(service->findReportingSessionForID(77, *owner()), sessionOf(0, 77));
}

TEST_F(TWReportingServiceTest, AnUnknownIdentifierIsAnError) {
  EXPECT_EQ(service->findReportingSessionForID(5, *owner()), nullptr);
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kError), ElementsAre("failed to find reporting session 5"));
}

TEST_F(TWReportingServiceTest, IdentifierZeroAndDisabledReportingFindNothingAndLogNothing) {
  const auto client = connect(11);
  create(*client, 0);
  create(*client, 77);
  test.log.clear();
  EXPECT_EQ(service->findReportingSessionForID(0, *owner()), nullptr);
  service->setReportingEnabled(false);
  EXPECT_EQ(service->findReportingSessionForID(77, *owner()), nullptr);
  EXPECT_THAT(test.log.lines(), IsEmpty());
}

// Finding a message's sessions.

TEST_F(TWReportingServiceTest, AMessageWithIdentifiersGoesToTheKnownOnesInOrder) {
  const auto client = connect(11);
  create(*client, 77);
  create(*client, 78);
  EXPECT_THAT(identifiersFoundFor({{78, 0, 5, 77}}), ElementsAre(78, 77));
}

TEST_F(TWReportingServiceTest, AMessageToIdentifierZeroGoesToNoSessionAtAll) {
  EXPECT_THAT(identifiersFoundFor({{0}}), IsEmpty());
  EXPECT_THAT(identifiersFoundFor({{5}}), IsEmpty());
  EXPECT_THAT(test.log.textsOf("twrs"), Not(Contains("Creating singleMessageSession")));
}

TEST_F(TWReportingServiceTest, AMessageWithoutIdentifiersGoesToEveryStartedSessionOfEveryClient) {
  const auto first = connect(11);
  const auto second = connect(12);
  start(*first, 78);
  start(*first, 77);
  create(*first, 79);
  start(*second, 5);
  EXPECT_THAT(identifiersFoundFor(kNoIDs), ElementsAre(77, 78, 5));
  EXPECT_THAT(identifiersFoundFor({{}}), ElementsAre(77, 78, 5));
  EXPECT_THAT(test.log.textsOf("twrs"), Not(Contains("Creating singleMessageSession")));
}

TEST_F(TWReportingServiceTest, ListsTheActiveSessionsInTheLog) {
  const auto client = connect(11);
  start(*client, 77);
  test.log.clear();
  identifiersFoundFor(kNoIDs);
  const auto lines = test.log.textsOf("twrs", LogLevel::kDebug);
  EXPECT_THAT(
      lines, Contains(StartsWith("sessions for client 11 : (reporterID=77,serviceName=unknown,ownerPid=11")));
  EXPECT_THAT(lines, Contains(StartsWith("1 active reporting session(s) (reporterID=77,")));
}

// The single-message session.

TEST_F(TWReportingServiceTest, WithNoStartedSessionAMessageWithoutIdentifiersMakesTheSingleMessageSession) {
  const auto client = connect(11);
  create(*client, 77);
  const auto sessions = service->findReportingSessionsForIDs(kNoIDs, owner());
  ASSERT_THAT(sessions, SizeIs(1));
  const auto& single = *sessions[0];
  EXPECT_EQ(single.reporterID(), 1);
  EXPECT_TRUE(single.isSingleMessageSession());
  EXPECT_TRUE(single.started());
  EXPECT_EQ(single.serviceName(), "standalone");
  EXPECT_EQ(single.configuration(), (ValueMap{{"HostApplicationDisplayID", "Unknown"}}));
  EXPECT_THAT(single.processIdentifiers(), ElementsAre(test.processes.ownProcessIdentifier()));
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo), Contains("Creating singleMessageSession"));
  EXPECT_THAT(service->getAllActiveReportingSessions(*owner()), IsEmpty());  // it belongs to no client
}

TEST_F(TWReportingServiceTest, AClientsSessionOneIsNotTheSingleMessageSession) {
  const auto client = connect(11);
  create(*client, 1);
  const auto single = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  EXPECT_NE(single, sessionOf(0, 1));
  EXPECT_EQ(service->findReportingSessionForID(1, *owner()), sessionOf(0, 1));
}

TEST_F(TWReportingServiceTest, WithAStartedSessionOfAnyClientNoSingleMessageSessionIsMade) {
  const auto client = connect(11);
  start(*client, 77);
  EXPECT_THAT(identifiersFoundFor(kNoIDs), ElementsAre(77));
  EXPECT_THAT(test.log.textsOf("twrs"), Not(Contains("Creating singleMessageSession")));
}

TEST_F(TWReportingServiceTest, MessagesKeepTheSingleMessageSessionAliveUntilFiveSecondsAfterTheLast) {
  const auto first = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  test.clock.advance(4.0);
  EXPECT_EQ(service->findReportingSessionsForIDs(kNoIDs, owner()).at(0), first);
  test.clock.advance(5.0);
  run();
  EXPECT_TRUE(first->started());
  test.clock.advance(0.5);
  run();
  EXPECT_FALSE(first->started());
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo),
              Contains("Stopping singleMessageSession after timeout=5.000000"));
  EXPECT_NE(service->findReportingSessionsForIDs(kNoIDs, owner()).at(0), first);
}

TEST_F(TWReportingServiceTest, AJumpOfTheWallClockNeitherEndsTheSingleMessageSessionNorKeepsIt) {
  const auto single = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  test.clock.setNow(test.clock.now() + 3600.0);
  test.clock.advance(4.0);
  run();
  EXPECT_TRUE(single->started());
  test.clock.setNow(test.clock.now() - 7200.0);
  test.clock.advance(1.5);
  run();
  EXPECT_FALSE(single->started());
}

TEST_F(TWReportingServiceTest, TheReaperLogsWhyItWaits) {
  identifiersFoundFor(kNoIDs);
  test.clock.advance(0.5);
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kDebug),
              Contains("Not stopping singleMessageSession. elapsed=0.500000 timeout=5.000000"));
}

TEST_F(TWReportingServiceTest, TheReaperQueuesTheStopOfTheSession) {
  const auto single = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  test.clock.advance(6.0);
  EXPECT_TRUE(single->started());  // taken out, not yet stopped
  run();
  EXPECT_FALSE(single->started());
}

// The session was kept until the clock showed that time again.
TEST_F(TWReportingServiceTest, TheReaperStopsTheSessionAlsoWhenTheWallClockWasSetBack) {
  const auto single = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  test.clock.setNow(test.clock.now() - 86'400.0);
  test.clock.advance(6.0);
  run();
  EXPECT_FALSE(single->started());
}

TEST_F(TWReportingServiceTest, TheReapersTimerEndsWithTheSessionAndTheNextSessionHasANewOne) {
  identifiersFoundFor(kNoIDs);
  test.clock.advance(6.0);
  run();
  test.log.clear();
  test.clock.advance(10.0);
  EXPECT_THAT(test.log.textsOf("twrs"), IsEmpty());
  const auto next = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  test.clock.advance(6.0);
  run();
  EXPECT_FALSE(next->started());
}

TEST_F(TWReportingServiceTest, ATickWithoutASessionDoesNothing) {
  test.log.clear();
  service->_reapSingleMessageSession();
  run();
  EXPECT_THAT(test.log.textsOf("twrs"), IsEmpty());
}

TEST_F(TWReportingServiceTest, MonitorsTheSystemOnTheWorkQueueAsSoonAsItIsMade) {
  const auto map = TWReportingSystemMonitor::getSystemMonitorDictionary();
  ASSERT_NE(map, nullptr);
  EXPECT_FALSE(test.notifications.post("com.orvane.homedeck.ringerstate", 1));
  EXPECT_EQ(map->find("ringerstate"), std::nullopt);
  test.queues.find("com.orvane.tonewerk.reporting.server")->runAll();
  ASSERT_NE(map->find("ringerstate"), std::nullopt);
  EXPECT_TRUE(map->find("ringerstate")->boolean("ringerstate"));
}

TEST_F(TWReportingServiceTest, AtItsEndTheDaemonStopsTheSingleMessageSession) {
  const auto single = service->findReportingSessionsForIDs(kNoIDs, owner()).at(0);
  service->stopSingleMessageSessions();
  EXPECT_FALSE(single->started());
  service->stopSingleMessageSessions();
  EXPECT_THAT(identifiersFoundFor(kNoIDs), ElementsAre(1));
}

}  // namespace
}  // namespace tonewerk
