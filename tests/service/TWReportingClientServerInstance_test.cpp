// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingClientServerInstance.h"

#include <gtest/gtest.h>
#include <string>

#include "support/ServiceTest.h"
#include "support/TestWorkers.h"

namespace tonewerk {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

class RequestTest : public ServiceTest {
 protected:
  RequestTest() : ServiceTest(testWorkerClasses()) {
    client = connect(11);
    run();
  }

  Value validityOf(ReporterID reporterID) { return askOnce(*client, "reporterIDValid", {reporterID}); }

  // The messages that the Metricon test worker has got since the last call, as "a=" and their value.
  std::vector<std::string> delivered() {
    std::vector<std::string> got;
    for (const std::string& event : journal.take()) {
      if (event.starts_with("Metricon got ")) got.push_back(event.substr(13));
    }
    return got;
  }

  void send(const ValueMap& payload, Argument identifiers) {
    ask(*client, "sendMessage", {payload, 4, 1, std::move(identifiers)});
  }

  std::vector<std::string> logged(LogLevel level = LogLevel::kDebug) {
    return test.log.textsOf("twrs", level);
  }

  TestWorkerJournal journal;
  std::unique_ptr<MemoryClient> client;
};

// Create.

TEST_F(RequestTest, CreateMakesASessionOfTheClient) {
  test.processes.setName(12, "player");
  const auto player = connect(12);
  EXPECT_EQ(askOnce(*player, "createReportingSession", {77}), Value(true));
  const auto session = sessionOf(1, 77);
  ASSERT_NE(session, nullptr);
  EXPECT_FALSE(session->started());
  EXPECT_THAT(session->processIdentifiers(), ElementsAre(12));
  EXPECT_EQ(session->clientProcessName(), "player");
  EXPECT_THAT(logged(), Contains("creating session for reporter 77"));
  EXPECT_THAT(logged(LogLevel::kInfo), Contains("session created for reporter 77"));
  EXPECT_THAT(test.tracePoints.codes(), Contains(0x21044814U));
}

TEST_F(RequestTest, CreatingTheSameIdentifierTwiceDropsTheFirstSessionWithoutAStop) {
  start(*client, 77);
  const std::weak_ptr<TWReportingSession> first = sessionOf(0, 77);
  journal.take();
  create(*client, 77);
  EXPECT_TRUE(first.expired());
  EXPECT_FALSE(sessionOf(0, 77)->started());
  EXPECT_THAT(journal.take(), Not(Contains("Metricon stopped")));
}

// It would otherwise be shown as one that runs, for as long as the daemon does.
TEST_F(RequestTest, TheLifeOfASessionThatIsCreatedAnewEnds) {
  start(*client, 77);
  ASSERT_THAT(test.sessionBook.entries(), SizeIs(1));
  create(*client, 77);
  const auto entries = test.sessionBook.entries();
  ASSERT_THAT(entries, SizeIs(2));
  EXPECT_EQ(entries[1].life, entries[0].life);
  ASSERT_TRUE(entries[1].end);
  EXPECT_EQ(entries[1].end->ending, SessionEnding::kReplaced);
}

TEST_F(RequestTest, IdentifierZeroIsStoredAndReachedOnlyWhenTheClientEnds) {
  create(*client, 0);
  const std::weak_ptr<TWReportingSession> session = sessionOf(0, 0);
  for (const char* method :
       {"startReportingSessionForID", "stopReportingSessionForID", "destroyReportingSession"}) {
    EXPECT_EQ(askOnce(*client, method, {0}), Value(true));
  }
  EXPECT_EQ(askOnce(*client, "setServiceType", {2, 0}), Value(true));
  EXPECT_EQ(askOnce(*client, "setConfiguration", {ValueMap{{"a", 1}}, 0}), Value(true));
  send({{"a", 1}}, Value(ValueArray{0}));
  EXPECT_FALSE(session.lock()->started());
  EXPECT_EQ(session.lock()->serviceType(), 65535);
  EXPECT_TRUE(session.lock()->configuration().empty());
  EXPECT_THAT(session.lock()->messages(), IsEmpty());
  EXPECT_EQ(validityOf(0), Value(ValueMap{{"reporterID", 0}, {"serviceType", 65535}}));
  client->disconnect();
  run();
  EXPECT_TRUE(session.expired());
}

TEST_F(RequestTest, AConnectionHoldsSessionsUpToItsLimit) {
  constexpr auto kMax = static_cast<ReporterID>(TWReportingClientServerInstance::kMaxSessions);
  for (ReporterID reporterID = 1; reporterID <= kMax; ++reporterID) {
    client->notify("createReportingSession", {reporterID});
  }
  run();
  const auto refused = ask(*client, "createReportingSession", {kMax + 1});
  ASSERT_THAT(refused, SizeIs(1));
  EXPECT_EQ(refused[0].error->domain, "com.orvane.tonewerk.messaging");
  EXPECT_EQ(refused[0].error->code, 3);
  EXPECT_THAT(refused[0].error->message, HasSubstr("4096"));
  EXPECT_EQ(sessionOf(0, kMax + 1), nullptr);
  create(*client, kMax);  // replaces a session
  askOnce(*client, "destroyReportingSession", {1});
  create(*client, kMax + 1);
}

// Service type.

TEST_F(RequestTest, SettingTheSameServiceTypeKeepsTheSession) {
  create(*client, 77);
  const auto session = sessionOf(0, 77);
  EXPECT_EQ(askOnce(*client, "setServiceType", {65535, 77}), Value(true));
  EXPECT_EQ(sessionOf(0, 77), session);
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kInfo), Contains("setting service type unknown"));
}

TEST_F(RequestTest, ChangingTheServiceTypeReplacesAStartedSessionByAnUnstartedOneWithItsValues) {
  test.processes.setName(12, "player");
  const auto player = connect(12);
  start(*player, 77);
  ask(*player, "setConfiguration", {ValueMap{{"HostApplicationDisplayID", "app"}}, 77});
  ask(*player, "sendMessage", {ValueMap{{"volume", 1}}, 4, 1, Value(ValueArray{77})});
  const auto first = sessionOf(1, 77);
  journal.take();

  EXPECT_EQ(askOnce(*player, "setServiceType", {2, 77}), Value(true));

  const auto second = sessionOf(1, 77);
  EXPECT_NE(second, first);
  EXPECT_TRUE(first->started());  // dropped, not stopped
  EXPECT_FALSE(second->started());
  EXPECT_EQ(second->serviceType(), 2);
  EXPECT_EQ(second->configuration(), first->configuration());
  EXPECT_EQ(second->previousValues(), first->previousValues());
  EXPECT_EQ(second->clientProcessName(), std::nullopt);
  EXPECT_THAT(second->messages(), IsEmpty());
  EXPECT_THAT(journal.take(), Not(Contains("Metricon stopped")));
  EXPECT_THAT(logged(), AllOf(Contains("setting service type 2 for reporter 77"),
                              Contains("service type 2 set for reporter  77")));
}

// The session that comes with a change of service type had no process in the store.
TEST_F(RequestTest, TheBookNamesTheProcessOfEachSessionOfAClient) {
  test.processes.setName(12, "player");
  const auto player = connect(12);
  start(*player, 77);
  ask(*player, "setServiceType", {2, 77});
  EXPECT_EQ(sessionOf(1, 77)->clientProcessName(), std::nullopt);
  ask(*player, "startReportingSessionForID", {77});
  ASSERT_FALSE(test.sessionBook.entries().empty());
  for (const auto& entry : test.sessionBook.entries()) EXPECT_EQ(entry.process, "player");
}

TEST_F(RequestTest, SettingTheServiceTypeOfAnUnknownSessionDoesNothingAndIsAnswered) {
  EXPECT_EQ(askOnce(*client, "setServiceType", {2, 5}), Value(true));
  EXPECT_EQ(askOnce(*client, "setServiceType", {2, 0}), Value(true));
  EXPECT_THAT(logged(), Not(Contains(HasSubstr("set for reporter"))));
}

TEST_F(RequestTest, TheServiceTypeOfAnyClientsSessionCanBeAsked) {
  const auto other = connect(12);
  create(*other, 78);
  ask(*other, "setServiceType", {7, 78});
  EXPECT_EQ(askOnce(*client, "getServiceNameForReporterID", {78}), Value(7));
  EXPECT_EQ(askOnce(*client, "getServiceNameForReporterID", {5}), Value(65535));
  EXPECT_THAT(logged(),
              AllOf(Contains("fetching seviceType"), Contains("returning service type 7 for reporter  78"),
                    Contains("returning service type 65535 for reporter  5")));
}

TEST_F(RequestTest, AServiceTypeQueryOfZeroIsAnsweredTwice) {
  const auto answers = ask(*client, "getServiceNameForReporterID", {0});
  ASSERT_THAT(answers, SizeIs(2));
  for (const auto& answer : answers) EXPECT_EQ(answer.result, Value(65535));
}

// Configuration.

TEST_F(RequestTest, ConfigurationIsMergedIntoTheClientsOwnSessionOnly) {
  create(*client, 77);
  const auto other = connect(12);
  create(*other, 78);
  EXPECT_EQ(askOnce(*client, "setConfiguration", {ValueMap{{"a", 1}}, 77}), Value(true));
  EXPECT_EQ(askOnce(*client, "setConfiguration", {ValueMap{{"b", 2}}, 77}), Value(true));
  EXPECT_EQ(askOnce(*client, "setConfiguration", {ValueMap{{"a", 1}}, 78}), Value(true));
  EXPECT_EQ(sessionOf(0, 77)->configuration(), (ValueMap{{"a", 1}, {"b", 2}}));
  EXPECT_TRUE(sessionOf(1, 78)->configuration().empty());
  EXPECT_THAT(logged(), Contains("setting configuration"));
}

TEST_F(RequestTest, AConfigurationPastTheBudgetIsRefusedAndChangesNothing) {
  create(*client, 77);
  const std::string megabyte(1 << 20, 'x');
  std::vector<MemoryResponse> answers;
  for (int n = 0; n < 256; ++n) {
    answers = ask(*client, "setConfiguration", {ValueMap{{std::to_string(n), megabyte}}, 77});
  }
  ASSERT_THAT(answers, SizeIs(1));
  ASSERT_TRUE(answers[0].error);
  EXPECT_EQ(answers[0].error->code, 3);
  EXPECT_EQ(sessionOf(0, 77)->configuration().size(), 255U);
}

// A full budget.

class FullBudgetTest : public RequestTest {
 protected:
  // Leaves room for less than a megabyte.
  FullBudgetTest() {
    create(*client, 70);
    ValueMap configuration;
    for (int n = 0; n < 255; ++n) configuration.set(std::to_string(n), megabyte);
    EXPECT_EQ(askOnce(*client, "setConfiguration", {configuration, 70}), Value(true));
  }

  // Creates a session, does not start it, and sends it a message that does not fit into the budget.
  void createOverBudget(ReporterID reporterID) {
    create(*client, reporterID);
    send({{"text", megabyte}}, Value(ValueArray{reporterID}));
    EXPECT_THAT(sessionOf(0, reporterID)->messages(), IsEmpty());
  }

  std::vector<std::string> takeUnkeptLines() {
    std::vector<std::string> lines = test.log.textsOf("twrr", LogLevel::kError);
    std::erase_if(lines, [](const std::string& line) { return !line.starts_with("messages delivered"); });
    test.log.clear();
    return lines;
  }

  static std::string unkept(ReporterID reporterID) {
    return "messages delivered but not kept: count=1 reporterID=" + std::to_string(reporterID);
  }

  const Value megabyte{std::string(1 << 20, 'x')};
};

TEST_F(FullBudgetTest, ANeverStartedSessionLogsUnkeptMessagesWhenItIsStopped) {
  createOverBudget(77);
  ask(*client, "stopReportingSessionForID", {77});
  EXPECT_THAT(takeUnkeptLines(), ElementsAre(unkept(77)));
  ask(*client, "stopReportingSessionForID", {77});
  EXPECT_THAT(takeUnkeptLines(), IsEmpty());
}

TEST_F(FullBudgetTest, ANeverStartedSessionLogsUnkeptMessagesWhenItEnds) {
  createOverBudget(77);
  create(*client, 77);
  EXPECT_THAT(takeUnkeptLines(), ElementsAre(unkept(77)));
  createOverBudget(78);
  ask(*client, "destroyReportingSession", {78});
  EXPECT_THAT(takeUnkeptLines(), ElementsAre(unkept(78)));
  createOverBudget(79);
  ask(*client, "setServiceType", {2, 79});
  EXPECT_THAT(takeUnkeptLines(), ElementsAre(unkept(79)));
  createOverBudget(80);
  client->disconnect();
  run();
  EXPECT_THAT(takeUnkeptLines(), ElementsAre(unkept(80)));
}

// The configuration is never counted for the old and the new session at once.
TEST_F(FullBudgetTest, AChangeOfTheServiceTypeAlwaysSucceedsAndKeepsTheValues) {
  const ValueMap configuration = sessionOf(0, 70)->configuration();
  send({{"volume", 1}}, Value(ValueArray{70}));
  const ValueMap previousValues = sessionOf(0, 70)->previousValues();
  for (const int serviceType : {2, 3, 2}) {
    EXPECT_EQ(askOnce(*client, "setServiceType", {serviceType, 70}), Value(true));
    EXPECT_EQ(sessionOf(0, 70)->serviceType(), serviceType);
    EXPECT_EQ(sessionOf(0, 70)->configuration(), configuration);
    EXPECT_EQ(sessionOf(0, 70)->previousValues(), previousValues);
  }
  EXPECT_EQ(ask(*client, "setConfiguration", {ValueMap{{"more", megabyte}}, 70}).at(0).error->code, 3);
  EXPECT_THAT(takeUnkeptLines(), IsEmpty());
}

TEST_F(FullBudgetTest, AReplacedSessionThatLivesOnNoLongerCounts) {
  const auto first = sessionOf(0, 70);
  for (const int serviceType : {2, 3, 2}) ask(*client, "setServiceType", {serviceType, 70});
  ask(*client, "destroyReportingSession", {70});
  create(*client, 70);
  EXPECT_EQ(askOnce(*client, "setConfiguration", {first->configuration(), 70}), Value(true));
}

// Start and stop.

TEST_F(RequestTest, TheStartIsAnsweredAtTheStopBeforeTheStopItself) {
  create(*client, 77);
  const auto started = client->request("startReportingSessionForID", {77});
  run();
  EXPECT_TRUE(sessionOf(0, 77)->started());
  EXPECT_EQ(client->responseTo(started), std::nullopt);
  const auto before = client->responses().size();
  const auto stopped = client->request("stopReportingSessionForID", {77});
  run();
  const auto responses = client->responses();
  ASSERT_EQ(responses.size(), before + 2);
  EXPECT_EQ(responses[before].identifier, started);
  EXPECT_EQ(responses[before].result, Value(true));
  EXPECT_EQ(responses[before + 1].identifier, stopped);
  EXPECT_EQ(responses[before + 1].result, Value(true));
  EXPECT_FALSE(sessionOf(0, 77)->started());
  EXPECT_THAT(logged(), AllOf(Contains("starting session for reporter 77"),
                              Contains("stopping session for reporter 77"), Contains("stopping 77"),
                              Contains(StartsWith("1 active reporting session(s)")),
                              Contains("0 active reporting session(s) ()")));
  EXPECT_THAT(test.tracePoints.codes(), AllOf(Contains(0x21044818U), Contains(0x2104481CU)));
}

TEST_F(RequestTest, ASecondStartWithoutAStopGetsNoAnswer) {
  start(*client, 77);
  const auto second = client->request("startReportingSessionForID", {77});
  run();
  ask(*client, "stopReportingSessionForID", {77});
  EXPECT_EQ(client->responseTo(second), std::nullopt);
}

TEST_F(RequestTest, AnUnansweredStartIsNotAnUnfinishedRequest) {
  start(*client, 77);
  client->request("startReportingSessionForID", {77});
  EXPECT_EQ(client->unfinishedRequests(), 1U);
  run();
  EXPECT_EQ(client->unfinishedRequests(), 0U);
}

TEST_F(RequestTest, StartingAnUnknownSessionIsAnsweredAtOnce) {
  EXPECT_EQ(askOnce(*client, "startReportingSessionForID", {0}), Value(true));
  EXPECT_EQ(askOnce(*client, "startReportingSessionForID", {5}), Value(true));
  const auto other = connect(12);
  create(*other, 78);
  EXPECT_EQ(askOnce(*client, "startReportingSessionForID", {78}), Value(true));
  EXPECT_FALSE(sessionOf(1, 78)->started());
}

TEST_F(RequestTest, AfterAStopASessionMayBeStartedAgain) {
  start(*client, 77);
  ask(*client, "stopReportingSessionForID", {77});
  const auto again = client->request("startReportingSessionForID", {77});
  run();
  EXPECT_TRUE(sessionOf(0, 77)->started());
  ask(*client, "stopReportingSessionForID", {77});
  EXPECT_EQ(client->responseTo(again)->result, Value(true));
}

TEST_F(RequestTest, AStartAnswersAnEarlierStartThatWasStillWaiting) {
  start(*client, 77);
  const auto first = client->responses().size();
  sessionOf(0, 77)->stop();  // a stop without a request
  client->request("startReportingSessionForID", {77});
  run();
  EXPECT_EQ(client->responses().size(), first + 1);
}

TEST_F(RequestTest, OnInternalBuildsATestSessionsStartIsAnsweredAtOnceAndAgainAtItsStop) {
  makeInternalBuild();
  create(*client, 77);
  ask(*client, "setServiceType", {11, 77});
  const auto answers = ask(*client, "startReportingSessionForID", {77});
  ASSERT_THAT(answers, SizeIs(1));
  ask(*client, "stopReportingSessionForID", {77});
  std::size_t count = 0;
  for (const auto& response : client->responses())
    count += response.identifier == answers[0].identifier ? 1 : 0;
  EXPECT_EQ(count, 2U);
}

TEST_F(RequestTest, OnOtherBuildsATestSessionsStartWaitsLikeAnyOther) {
  create(*client, 77);
  ask(*client, "setServiceType", {11, 77});
  EXPECT_THAT(ask(*client, "startReportingSessionForID", {77}), IsEmpty());
}

TEST_F(RequestTest, StoppingAnUnstartedSessionIsAnsweredAndLogged) {
  EXPECT_EQ(askOnce(*client, "stopReportingSessionForID", {5}), Value(true));
  create(*client, 77);
  EXPECT_EQ(askOnce(*client, "stopReportingSessionForID", {77}), Value(true));
  EXPECT_THAT(sessionOf(0, 77)->messages(), IsEmpty());  // the session was not asked to stop
  EXPECT_THAT(logged(),
              AllOf(Contains("Stop called, but session==nil or session.started==false. reporterID=5 "
                             "session=(null) session.started=0"),
                    Contains(StartsWith("Stop called, but session==nil or session.started==false. "
                                        "reporterID=77 session=reporterID=77,")),
                    Contains("stopping 5")));
}

TEST_F(RequestTest, AStoppedSessionStaysInTheMap) {
  start(*client, 77);
  ask(*client, "stopReportingSessionForID", {77});
  EXPECT_NE(sessionOf(0, 77), nullptr);
}

TEST_F(RequestTest, EachRequestsBodyIsAnIntervalForPerformanceTraces) {
  test.tracePoints.clear();
  create(*client, 77);
  client->request("startReportingSessionForID", {77});
  run();
  send({{"a", 1}}, Value(ValueArray{77}));
  ask(*client, "stopReportingSessionForID", {77});
  ask(*client, "destroyReportingSession", {77});
  std::vector<std::string> expected;
  for (const char* name : {"createReportingSession 77", "startReportingSessionForID 77", "sendMessage 0",
                           "stopReportingSessionForID 77", "destroyReportingSession 77"}) {
    expected.push_back(std::string("begin ") + name);
    expected.push_back(std::string("end ") + name);
  }
  EXPECT_THAT(test.tracePoints.intervals(), ElementsAreArray(expected));
}

// Messages.

TEST_F(RequestTest, AMessageReachesEachNamedSessionWithARecordOfItsOwn) {
  create(*client, 77);
  create(*client, 78);
  send({{"a", 1}}, Value(ValueArray{77, 78, 5, 0}));
  EXPECT_THAT(delivered(), ElementsAre("a=1", "a=1"));
  auto* first = sessionOf(0, 77)->messages().front();
  auto* second = sessionOf(0, 78)->messages().front();
  EXPECT_NE(first, second);
  EXPECT_EQ(first->category, 4U);
  EXPECT_EQ(first->type, 1);
  first->message.set("a", 2);
  EXPECT_EQ(second->message.integer("a"), 1);
  EXPECT_THAT(logged(), Contains("sending message for reporter (77, 78, 5, 0)"));
  EXPECT_THAT(test.tracePoints.codes(), Contains(0x21044824U));
}

TEST_F(RequestTest, AMessageReachesSessionsOfOtherClients) {
  const auto other = connect(12);
  create(*other, 78);
  send({{"a", 1}}, Value(ValueArray{78}));
  EXPECT_THAT(sessionOf(1, 78)->messages(), SizeIs(1));
}

TEST_F(RequestTest, AMessageNamesSessionsUpToTheLimitOfAConnection) {
  create(*client, 77);
  const auto named = [](std::size_t count) {
    return Value(ValueArray(std::vector<Value>(count, Value(77))));
  };
  const auto taken = ask(*client, "sendMessage", {ValueMap{{"a", 1}}, 4, 1, named(4096)});
  EXPECT_EQ(taken.at(0).error, std::nullopt);
  EXPECT_EQ(sessionOf(0, 77)->totalMessageCount(), 4096U);
  const auto refused = ask(*client, "sendMessage", {ValueMap{{"a", 2}}, 4, 1, named(4097)});
  EXPECT_EQ(refused.at(0).error->code, 3);
  EXPECT_EQ(sessionOf(0, 77)->totalMessageCount(), 4096U);
}

TEST_F(RequestTest, AMessageIsAnsweredWithNil) {
  const auto answers = ask(*client, "sendMessage", {ValueMap{{"a", 1}}, 4, 1, std::nullopt});
  ASSERT_THAT(answers, SizeIs(1));
  EXPECT_EQ(answers[0].error, std::nullopt);
  EXPECT_EQ(answers[0].result, std::nullopt);
}

TEST_F(RequestTest, WhileReportingIsDisabledAMessageIsRefused) {
  create(*client, 77);
  service->setReportingEnabled(false);
  const auto answers = ask(*client, "sendMessage", {ValueMap{{"a", 1}}, 4, 1, Value(ValueArray{77})});
  ASSERT_THAT(answers, SizeIs(1));
  EXPECT_EQ(answers[0].error, (ReplyError{"com.orvane.audio.reporting", 1, ""}));
  EXPECT_THAT(sessionOf(0, 77)->messages(), IsEmpty());
}

TEST_F(RequestTest, OnInternalBuildsAMessageWithoutIdentifiersIsMarked) {
  makeInternalBuild();
  start(*client, 77);
  send({{"a", 1}}, std::nullopt);
  EXPECT_EQ(*sessionOf(0, 77)->messages().back()->message.find("sendSingleMessage"), Value(true));
  send({{"a", 2}}, Value(ValueArray{}));
  EXPECT_TRUE(sessionOf(0, 77)->messages().back()->message.contains("sendSingleMessage"));
  send({{"a", 3}}, Value(ValueArray{77}));
  EXPECT_FALSE(sessionOf(0, 77)->messages().back()->message.contains("sendSingleMessage"));
}

TEST_F(RequestTest, OnOtherBuildsAMessageWithoutIdentifiersIsNotMarked) {
  start(*client, 77);
  send({{"a", 1}}, Value(ValueArray{}));
  EXPECT_FALSE(sessionOf(0, 77)->messages().back()->message.contains("sendSingleMessage"));
}

TEST_F(RequestTest, WhileReportingIsDisabledNothingIsMarked) {
  makeInternalBuild();
  service->setReportingEnabled(false);
  EXPECT_TRUE(ask(*client, "sendMessage", {ValueMap{{"a", 1}}, 4, 1, std::nullopt}).at(0).error);
}

TEST_F(RequestTest, WithoutAStartedSessionAMessageWithoutIdentifiersGoesToTheSingleMessageSession) {
  send({{"a", 1}}, std::nullopt);
  EXPECT_THAT(delivered(), ElementsAre("a=1"));
  EXPECT_THAT(logged(), Contains("sending message for reporter (null)"));
}

// Destroy.

TEST_F(RequestTest, DestroyStopsAndDropsAStartedSessionAndLeavesItsStartUnanswered) {
  create(*client, 77);
  const auto started = client->request("startReportingSessionForID", {77});
  run();
  const std::weak_ptr<TWReportingSession> session = sessionOf(0, 77);
  journal.take();
  EXPECT_EQ(askOnce(*client, "destroyReportingSession", {77}), Value(true));
  EXPECT_TRUE(session.expired());
  EXPECT_THAT(journal.take(), Contains("Metricon stopped"));
  EXPECT_EQ(client->responseTo(started), std::nullopt);
  EXPECT_THAT(logged(), AllOf(Contains("destroying session for reporter 77"), Contains("destroying 77")));
  EXPECT_THAT(test.tracePoints.codes(), Contains(0x21044820U));
}

TEST_F(RequestTest, DestroyingAnUnstartedOrUnknownSessionStopsNothing) {
  create(*client, 77);
  journal.take();
  EXPECT_EQ(askOnce(*client, "destroyReportingSession", {77}), Value(true));
  EXPECT_EQ(askOnce(*client, "destroyReportingSession", {77}), Value(true));
  EXPECT_EQ(askOnce(*client, "destroyReportingSession", {0}), Value(true));
  EXPECT_THAT(journal.take(), IsEmpty());
}

TEST_F(RequestTest, AnotherClientsSessionIsNeitherStoppedNorDestroyed) {
  const auto other = connect(12);
  start(*other, 78);
  EXPECT_EQ(askOnce(*client, "stopReportingSessionForID", {78}), Value(true));
  EXPECT_EQ(askOnce(*client, "destroyReportingSession", {78}), Value(true));
  EXPECT_TRUE(sessionOf(1, 78)->started());
}

// Questions.

TEST_F(RequestTest, ValidityAnswersIdentifierAndTypeOfAnyClientsSession) {
  const auto other = connect(12);
  create(*other, 78);
  ask(*other, "setServiceType", {7, 78});
  EXPECT_EQ(validityOf(78), Value(ValueMap{{"reporterID", 78}, {"serviceType", 7}}));
  EXPECT_EQ(validityOf(5), Value(ValueMap{{"reporterID", 0}, {"serviceType", 65535}}));
  EXPECT_EQ(validityOf(0), Value(ValueMap{{"reporterID", 0}, {"serviceType", 65535}}));
  EXPECT_THAT(logged(), Contains("validating reporter 78"));
  EXPECT_THAT(logged(LogLevel::kDefault), Contains("validating reporter 78"));
}

TEST_F(RequestTest, AllReportersAreListedByClientInOrderOfConnection) {
  EXPECT_EQ(askOnce(*client, "getAllReporters", {}), Value(ValueArray{}));
  const auto other = connect(12);
  create(*other, 5);
  create(*client, 78);
  create(*client, 77);
  EXPECT_EQ(askOnce(*client, "getAllReporters", {}), Value(ValueArray{77, 78, 5}));
}

// Kill.

TEST_F(RequestTest, KillEndsTheProcessAtOnceWithoutAnAnswerOrAStop) {
  start(*client, 77);
  journal.take();
  const auto killed = client->request("killService", {});
  EXPECT_EQ(processEnds, 1);  // before the work queue runs
  run();
  EXPECT_EQ(client->responseTo(killed), std::nullopt);
  EXPECT_TRUE(sessionOf(0, 77)->started());
  EXPECT_THAT(journal.take(), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kDefault), Contains("DESTROYING SERVICE"));
}

// Requests and threads.

TEST_F(RequestTest, NothingHappensBeforeTheWorkQueueRuns) {
  client->request("createReportingSession", {77});
  EXPECT_EQ(sessionOf(0, 77), nullptr);
  EXPECT_EQ(client->unfinishedRequests(), 1U);
  run();
  EXPECT_NE(sessionOf(0, 77), nullptr);
  EXPECT_EQ(client->unfinishedRequests(), 0U);
}

TEST_F(RequestTest, RequestsReadBeforeTheConnectionEndedStillRun) {
  create(*client, 77);
  client->notify("startReportingSessionForID", {77});
  client->notify("sendMessage", {ValueMap{{"a", 1}}, 4, 1, Value(ValueArray{77})});
  client->disconnect();
  run();
  EXPECT_THAT(journal.take(), AllOf(Contains("Metricon got a=1"), Contains("Metricon stopped")));
}

TEST_F(RequestTest, ARequestAfterTheServicesEndDoesNothing) {
  const auto orphan =
      std::make_shared<TWReportingClientServerInstance>(12, owner(), std::weak_ptr<TWReportingService>());
  orphan->createReportingSession(77, {});
  orphan->sendMessage({{"a", 1}}, 4, 1, std::nullopt, {});
  orphan->handleConnectionError();
  run();
  EXPECT_TRUE(orphan->clientReportingSessionMap().empty());
}

}  // namespace
}  // namespace tonewerk
