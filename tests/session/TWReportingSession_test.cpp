// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSession.h"

#include <cmath>
#include <functional>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "session/TWReportingSessionWorkerRegistry.h"
#include "support/ReportingTest.h"
#include "support/TestWorkers.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr double kYear = 365 * 24 * 3600.0;

std::vector<std::string> namesOf(const std::vector<const TWReportingSessionWorkerClass*>& classes) {
  std::vector<std::string> names;
  names.reserve(classes.size());
  for (const auto* workerClass : classes) names.emplace_back(workerClass->name);
  return names;
}

std::vector<std::string> namesOf(const TWReportingSession::Workers& workers) {
  std::vector<std::string> names;
  for (const auto& worker : workers) names.emplace_back(worker->workerClass().name);
  return names;
}

// A session without workers.
class TWReportingSessionTest : public ReportingTest {};

TEST_F(TWReportingSessionTest, ANewSessionIsUnknownUnstartedAndEmpty) {
  const auto session = makeSession(77);
  EXPECT_EQ(session->reporterID(), 77);
  EXPECT_THAT(session->processIdentifiers(), ElementsAre(4711));
  EXPECT_EQ(session->clientProcessName(), std::nullopt);
  EXPECT_EQ(session->serviceType(), 65535);
  EXPECT_EQ(session->serviceName(), "unknown");
  EXPECT_TRUE(session->configuration().empty());
  EXPECT_TRUE(session->previousValues().empty());
  EXPECT_THAT(session->messages(), IsEmpty());
  EXPECT_EQ(session->totalMessageCount(), 0U);
  EXPECT_FALSE(session->started());
  EXPECT_FALSE(session->isSingleMessageSession());
  EXPECT_FALSE(session->transactionCompleteBlock);
  EXPECT_EQ(session->workerInstanceCount(), 0U);
}

TEST_F(TWReportingSessionTest, LogsAndTracesItsCreationAndRelease) {
  makeSession(77).reset();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kInfo),
              ElementsAre("created reporting session for ID: 77", "deallocing this session 77"));
  EXPECT_THAT(test.tracePoints.codes(), ElementsAre(0x21044828U, 0x21044834U));
}

TEST_F(TWReportingSessionTest, TakesItsServiceNameFromItsServiceType) {
  const auto session = makeSession();
  session->setServiceType(2);
  EXPECT_EQ(session->serviceType(), 2);
  EXPECT_EQ(session->serviceName(), "telephony");
  EXPECT_EQ(test.log.textsOf("twrr", LogLevel::kInfo).back(), "setting service type telephony");
}

TEST_F(TWReportingSessionTest, DescribesItself) {
  const auto session = makeSession(77);
  EXPECT_EQ(session->description(),
            "reporterID=77,serviceName=unknown,ownerPid=4711,clientProcessName=(null),"
            "HostApplicationDisplayID=Unknown,started=0,singleMessageSession=0");
  session->setServiceType(7);
  session->setClientProcessName("player");
  session->setSingleMessageSession(true);
  session->start();
  const ValueMap configuration{{"HostApplicationDisplayID", "com.orvane.player"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  EXPECT_EQ(session->description(),
            "reporterID=77,serviceName=longformaudio,ownerPid=4711,clientProcessName=player,"
            "HostApplicationDisplayID=com.orvane.player,started=1,singleMessageSession=1");
}

// Configuration.

TEST_F(TWReportingSessionTest, ItsApplicationNameIsThatOfItsConfiguration) {
  const auto session = makeSession();
  EXPECT_EQ(session->applicationName(), "Unknown");
  const ValueMap configuration{{"HostApplicationDisplayID", "com.orvane.player"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  EXPECT_EQ(session->applicationName(), "com.orvane.player");
}

TEST_F(TWReportingSessionTest, AddsToItsConfiguration) {
  const auto session = makeSession();
  const ValueMap first{{"a", 1}, {"b", 1}};
  const ValueMap second{{"b", 2}, {"c", 3}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&first));
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(nullptr));
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&second));
  EXPECT_EQ(session->configuration(), (ValueMap{{"a", 1}, {"b", 2}, {"c", 3}}));
}

TEST_F(TWReportingSessionTest, TheQMApplicationNameIsUsedUnlessTheMapHasAnApplicationName) {
  const auto session = makeSession();
  const ValueMap quiet{{"QMHostApplicationDisplayID", "qm"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&quiet));
  EXPECT_EQ(session->configuration().text("HostApplicationDisplayID"), "qm");
  const ValueMap both{{"QMHostApplicationDisplayID", "qm2"}, {"HostApplicationDisplayID", "own"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&both));
  EXPECT_EQ(session->configuration().text("HostApplicationDisplayID"), "own");
  EXPECT_EQ(session->configuration().text("QMHostApplicationDisplayID"), "qm2");
}

// Start and stop messages.

TEST_F(TWReportingSessionTest, StartStoresAMessageWithTheNumberOfStoredMessages) {
  const auto session = makeSession(77);
  session->sendMessage(message({{"a", 1}}));
  session->start();
  ASSERT_THAT(session->messages(), SizeIs(2));
  const auto& start = *session->messages().back();
  EXPECT_EQ(start.category, 8U);
  EXPECT_EQ(start.type, 1);
  EXPECT_EQ(start.message, (ValueMap{{"method", "start"},
                                     {"messages_at_start", 1},
                                     {"unique_messages_at_start", 1},
                                     {"reporterid", 77},
                                     {"running_at_start", "NO"},
                                     {"invalid_timestamp", "nil"},
                                     {"twreporting_timestamp", test.clock.now()},
                                     {"audiotag", "SetupStart"}}));
  EXPECT_EQ(session->totalMessageCount(), 1U);  // only what came through sendMessage
  EXPECT_EQ(session->previousValues().find("method"), nullptr);
}

TEST_F(TWReportingSessionTest, AStopBeforeAnyStartStoresOneStopMessage) {
  const auto session = makeSession(77);
  session->stop();
  ASSERT_THAT(session->messages(), SizeIs(1));
  const auto& stop = *session->messages().back();
  EXPECT_EQ(stop.category, 8U);
  EXPECT_EQ(stop.type, 2);
  EXPECT_EQ(stop.message, (ValueMap{{"method", "stop"},
                                    {"messages_at_stop", 0},
                                    {"unique_messages_at_stop", 0},
                                    {"reporterid", 77},
                                    {"running_at_stop", "NO"},
                                    {"invalid_timestamp", "nil"},
                                    {"twreporting_timestamp", test.clock.now()},
                                    {"audiotag", "SetupStop"}}));
  EXPECT_THAT(test.tracePoints.codes(), Not(Contains(0x21044830U)));
}

TEST_F(TWReportingSessionTest, StartingAgainAddsOnlyASecondStartMessage) {
  const auto session = makeSession(77);
  session->start();
  test.log.clear();
  session->start();
  ASSERT_THAT(session->messages(), SizeIs(2));
  EXPECT_EQ(session->messages().back()->message.text("running_at_start"), "YES");
  EXPECT_THAT(test.log.textsOf("twrr"), ElementsAre("start called. reporterID=77", "77 is already started"));
  EXPECT_THAT(test.log.linesOf("twrr", LogLevel::kInfo), SizeIs(2));
}

TEST_F(TWReportingSessionTest, KnowsTheTimeOfItsStart) {
  const auto session = makeSession();
  EXPECT_EQ(session->startedAt(), std::nullopt);
  test.clock.advance(5);
  const auto start = test.clock.monotonic();
  session->start();
  test.clock.advance(5);
  session->start();  // changes nothing
  EXPECT_EQ(session->startedAt(), start);
  session->stop();
  EXPECT_EQ(session->startedAt(), std::nullopt);
}

TEST_F(TWReportingSessionTest, StopDropsMessagesAndCountsAndAStartMayFollow) {
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"a", 1}}));
  session->sendMessage(message({{"a", 1}}));
  EXPECT_EQ(session->redundantMessageCount(), 1U);
  session->stop();
  EXPECT_THAT(session->messages(), IsEmpty());
  EXPECT_EQ(session->totalMessageCount(), 0U);
  EXPECT_EQ(session->redundantMessageCount(), 0U);
  EXPECT_FALSE(session->started());
  EXPECT_EQ(session->previousValues().integer("a"), 1);
  session->start();
  EXPECT_TRUE(session->started());
  EXPECT_THAT(session->messages(), SizeIs(1));
}

TEST_F(TWReportingSessionTest, LogsAndTracesItsLifeInOrder) {
  auto session = makeSession(77);
  session->start();
  session->sendMessage(message({{"a", 1}}));
  session->stop();
  session.reset();
  EXPECT_THAT(test.tracePoints.codes(),
              ElementsAre(0x21044828U, 0x2104482CU, 0x21044838U, 0x21044830U, 0x21044834U));
  EXPECT_THAT(
      test.log.textsOf("twrr"),
      ElementsAre("created reporting session for ID: 77", "start called. reporterID=77",
                  "self.started==false. starting. reporterID=77",
                  AllOf(StartsWith("TWReportingSessionWorker action=sendMessage reporterID=77 app=Unknown "
                                   "redundant=NO message=category=Playback type=Generic {\"a\":1"),
                        EndsWith("}")),
                  "stop called. reporterID=77", "ending session. reporterID=77",
                  "deallocing this session 77"));
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kInfo),
              ElementsAre("created reporting session for ID: 77", "start called. reporterID=77",
                          "deallocing this session 77"));
}

TEST_F(TWReportingSessionTest, LogLinesBeginWithTheirFileAndLine) {
  makeSession();
  const std::string line = test.log.linesOf("twrr").front().message;
  EXPECT_THAT(line, StartsWith("       TWReportingSession:"));
  EXPECT_EQ(line.find("created"), 25 + 1 + 5 + 1U);
}

// How a message is normalised, stored and remembered.

TEST_F(TWReportingSessionTest, AMessageWithoutATimestampGetsTheTimeAndAMark) {
  const auto record = message({{"a", 1}});
  TWReportingSession::addMissingDates(*record);
  EXPECT_EQ(record->message,
            (ValueMap{{"a", 1}, {"invalid_timestamp", "nil"}, {"twreporting_timestamp", test.clock.now()}}));
}

TEST_F(TWReportingSessionTest, ATimestampAYearAndASecondOldIsReplacedAndMovedAside) {
  const double old = test.clock.now() - kYear - 1;
  const auto record = messageAt(old, {});
  TWReportingSession::addMissingDates(*record);
  EXPECT_EQ(record->message.number("invalid_timestamp"), old);
  EXPECT_EQ(record->message.number("twreporting_timestamp"), test.clock.now());
}

TEST_F(TWReportingSessionTest, ATimestampWithinTheYearOrInTheFutureIsKept) {
  const double now = test.clock.now();
  for (const double time : {now - kYear, now - 364 * 24 * 3600.0, now, now + 10 * kYear}) {
    const auto record = messageAt(time, {});
    TWReportingSession::addMissingDates(*record);
    EXPECT_EQ(record->message, (ValueMap{{"twreporting_timestamp", time}}));
  }
}

TEST_F(TWReportingSessionTest, ATimestampGivenAsTextOrDateIsReadAsItsNumber) {
  const auto text = message({{"twreporting_timestamp", "12"}});
  TWReportingSession::addMissingDates(*text);
  EXPECT_EQ(*text->message.find("invalid_timestamp"), Value("12"));
  const auto date = message({{"twreporting_timestamp", Date{test.clock.now()}}});
  TWReportingSession::addMissingDates(*date);
  EXPECT_FALSE(date->message.contains("invalid_timestamp"));
}

TEST_F(TWReportingSessionTest, SpacesInKeysBecomeUnderscoresAndOtherWhiteSpaceStays) {
  const auto record = message({{"a b  c", 1}, {"tab\tkey", 2}, {"line\nkey", 3}, {" ", 4}});
  TWReportingSession::removeWhiteSpaceFromKeys(*record);
  EXPECT_EQ(record->message, (ValueMap{{"tab\tkey", 2}, {"line\nkey", 3}, {"a_b__c", 1}, {"_", 4}}));
}

TEST_F(TWReportingSessionTest, ARepairedKeyReplacesAnExistingOne) {
  const auto record = message({{"a b", "first"}, {"a_b", "second"}});
  TWReportingSession::removeWhiteSpaceFromKeys(*record);
  EXPECT_EQ(record->message, (ValueMap{{"a_b", "first"}}));
}

TEST_F(TWReportingSessionTest, TheAudioTagIsCategoryAndTypeTogether) {
  const auto record = message({{"audiotag", "mine"}}, 0x20000004, 1);
  TWReportingSession::addAudioMessageTag(*record);
  EXPECT_EQ(record->message, (ValueMap{{"audiotag", "HAL_PlaybackStart"}}));
}

TEST_F(TWReportingSessionTest, AMessageWithoutAnApplicationGetsTheSessionsApplication) {
  const auto session = makeSession();
  const auto nameAfter = [&](const ValueMap& payload) {
    const auto record = message(payload);
    session->addAppName(*record);
    return record->message.text("HostApplicationDisplayID");
  };
  EXPECT_EQ(nameAfter({}), "Unknown");
  const ValueMap configuration{{"HostApplicationDisplayID", "com.orvane.player"}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  EXPECT_EQ(nameAfter({}), "com.orvane.player");
  EXPECT_EQ(nameAfter({{"HostApplicationDisplayID", "Unknown"}}), "com.orvane.player");
  EXPECT_EQ(nameAfter({{"HostApplicationDisplayID", "unknown"}}), "unknown");
  EXPECT_EQ(nameAfter({{"HostApplicationDisplayID", 5}}), "5");
}

TEST_F(TWReportingSessionTest, AMessageIsNormalisedInOrderCountedStoredAndRemembered) {
  const auto session = makeSession();
  bool replied = false;
  session->sendMessage(message({{"a key", 1}}, 4, 1), [&](const auto& error) { replied = !error; });
  EXPECT_TRUE(replied);
  EXPECT_EQ(session->totalMessageCount(), 1U);
  ASSERT_THAT(session->messages(), SizeIs(1));
  const auto& stored = session->messages().front();
  EXPECT_EQ(stored->message.text(),
            R"({"invalid_timestamp":"nil","twreporting_timestamp":1763633880.0,"a_key":1,)"
            R"("audiotag":"PlaybackStart","HostApplicationDisplayID":"Unknown"})");
  EXPECT_FALSE(stored->isSessionStarted);
  EXPECT_EQ(session->previousValues(), stored->message);
}

TEST_F(TWReportingSessionTest, AMessageKnowsWhetherItsSessionWasStarted) {
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"a", 1}}));
  EXPECT_TRUE(session->messages().back()->isSessionStarted);
}

TEST_F(TWReportingSessionTest, AStoredMessageIsACopy) {
  const auto session = makeSession();
  const auto record = message({{"a", 1}});
  session->sendMessage(record);
  record->message.set("a", 2);
  EXPECT_EQ(session->messages().back()->message.integer("a"), 1);
}

TEST_F(TWReportingSessionTest, PreviousValuesAreTheLatestOfEveryKey) {
  const auto session = makeSession();
  session->sendMessage(message({{"a", 1}, {"b", 1}}));
  session->sendMessage(message({{"b", 2}}));
  EXPECT_EQ(session->previousValues().integer("a"), 1);
  EXPECT_EQ(session->previousValues().integer("b"), 2);
}

// Redundancy.

class RedundancyTest : public ReportingTest {
 protected:
  bool isRedundantAfterSending(const ValueMap& payload, AudioEventCategory category = 4,
                               AudioEventType type = 1) {
    const auto record = message(payload, category, type);
    session->sendMessage(record);
    return record->isRedundant;
  }

  std::shared_ptr<TWReportingSession> session = makeSession();
};

TEST_F(RedundancyTest, ARepeatedMessageIsRedundantAndNotStored) {
  EXPECT_FALSE(isRedundantAfterSending({{"a", 1}}));
  EXPECT_TRUE(isRedundantAfterSending({{"a", 1}}));
  EXPECT_THAT(session->messages(), SizeIs(1));
  EXPECT_EQ(session->totalMessageCount(), 2U);
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug), Contains("marking event redundant"));
}

TEST_F(RedundancyTest, TimesAreIgnored) {
  const double now = test.clock.now();
  isRedundantAfterSending(
      {{"a", 1}, {"twreporting_timestamp", now}, {"processuptime_ms", 1}, {"systemuptime_sec", 1}});
  EXPECT_TRUE(isRedundantAfterSending(
      {{"a", 1}, {"twreporting_timestamp", now + 9}, {"processuptime_ms", 2}, {"systemuptime_sec", 2}}));
  EXPECT_TRUE(isRedundantAfterSending({{"a", 1}, {"twreporting_timestamp", now + 9}}));
}

TEST_F(RedundancyTest, AMessageWithAMissingAddedOrChangedKeyIsNotRedundant) {
  const double now = test.clock.now();
  isRedundantAfterSending({{"a", 1}, {"b", 2}, {"twreporting_timestamp", now}});
  EXPECT_FALSE(isRedundantAfterSending({{"a", 1}, {"twreporting_timestamp", now}}));
  EXPECT_FALSE(isRedundantAfterSending({{"a", 1}, {"b", 2}, {"c", 3}, {"twreporting_timestamp", now}}));
  EXPECT_FALSE(isRedundantAfterSending({{"a", 1}, {"b", 3}, {"c", 3}, {"twreporting_timestamp", now}}));
}

TEST_F(RedundancyTest, ValuesCompareByValue) {
  isRedundantAfterSending({{"a", 1}, {"list", ValueArray{1, "x"}}, {"map", ValueMap{{"p", 1}, {"q", true}}}});
  EXPECT_TRUE(isRedundantAfterSending(
      {{"map", ValueMap{{"q", 1}, {"p", 1.0}}}, {"list", ValueArray{1.0, "x"}}, {"a", 1.0}}));
}

TEST_F(RedundancyTest, ErrorsAreNeverRedundant) {
  for (const auto& [category, type] : {std::pair<AudioEventCategory, AudioEventType>{4, 6}, {11, 1}}) {
    EXPECT_FALSE(isRedundantAfterSending({{"a", 1}}, category, type));
    EXPECT_FALSE(isRedundantAfterSending({{"a", 1}}, category, type));
  }
}

TEST_F(RedundancyTest, AnErrorCategoryWithADomainDoesNotCountAsAnError) {
  EXPECT_FALSE(isRedundantAfterSending({{"a", 1}}, 0x2000000B, 1));
  EXPECT_TRUE(isRedundantAfterSending({{"a", 1}}, 0x2000000B, 1));
}

TEST_F(RedundancyTest, OnlyTheNewestOfTheSameCategoryAndTypeCounts) {
  isRedundantAfterSending({{"a", "A"}});
  isRedundantAfterSending({{"a", "B"}});
  EXPECT_FALSE(isRedundantAfterSending({{"a", "A"}}));
}

TEST_F(RedundancyTest, MessagesOfOtherCategoriesAndTypesDoNotMatter) {
  isRedundantAfterSending({{"a", "A"}}, 4, 1);
  EXPECT_FALSE(isRedundantAfterSending({{"a", "A"}}, 4, 2));
  EXPECT_FALSE(isRedundantAfterSending({{"a", "A"}}, 0x20000004, 1));
  EXPECT_TRUE(isRedundantAfterSending({{"a", "A"}}, 4, 1));
}

TEST_F(RedundancyTest, TheSessionsOwnStartMessageIsTheNewestOfItsKind) {
  session->start();
  ValueMap same = session->messages().back()->message;
  same.set("HostApplicationDisplayID", "Unknown");
  EXPECT_FALSE(isRedundantAfterSending(same, 8, 1));  // the start message has no application
  EXPECT_TRUE(isRedundantAfterSending(same, 8, 1));
}

TEST_F(RedundancyTest, NothingIsRememberedAcrossAStop) {
  session->start();
  isRedundantAfterSending({{"a", 1}});
  session->stop();
  EXPECT_FALSE(isRedundantAfterSending({{"a", 1}}));
}

// Decides by a search through the stored messages, newest first. The session's index must give the same
// result.
bool isRedundantBySearch(const TWReportingSession& session, const TWReportingSessionMessage& message) {
  if (message.type == 6 || message.category == 11) return false;
  const auto& stored = session.messages();
  for (auto earlier = stored.rbegin(); earlier != stored.rend(); ++earlier) {
    if ((*earlier)->type != message.type || (*earlier)->category != message.category) continue;
    ValueMap before = (*earlier)->message;
    ValueMap now = message.message;
    for (const char* key : {"processuptime_ms", "systemuptime_sec", "twreporting_timestamp"}) {
      before.erase(key);
      now.erase(key);
    }
    return before == now;
  }
  return false;
}

// Sends messages at stop, when the session has just sorted its messages by time, and compares index and
// search.
class ProbingProducer final : public TWReportingSessionWorkerProducerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit ProbingProducer(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  void stop() override {
    const auto owner = session.lock();
    for (const char* value : {"late", "early", "early", "late"}) {
      const auto record = std::make_shared<TWReportingSessionMessage>(
          ValueMap{{"a", value}, {"HostApplicationDisplayID", "x"}, {"twreporting_timestamp", 4e9}}, 4, 1);
      TWReportingSession::addAudioMessageTag(*record);
      const bool expected = isRedundantBySearch(*owner, *record);
      owner->sendMessage(record);
      EXPECT_EQ(record->isRedundant, expected) << value;
    }
  }
};
const TWReportingSessionWorkerClass ProbingProducer::kWorkerClass =
    workerClassOf<ProbingProducer>("ProbingProducer");

TEST_F(RedundancyTest, AfterTheSortAtStopTheNewestIsTheLatestByTime) {
  useWorkers({&ProbingProducer::kWorkerClass});
  session = makeSession();
  session->start();
  const double now = test.clock.now();
  session->sendMessage(messageAt(now + 100, {{"a", "late"}, {"HostApplicationDisplayID", "x"}}, 4, 1));
  session->sendMessage(messageAt(now + 50, {{"a", "early"}, {"HostApplicationDisplayID", "x"}}, 4, 1));
  session->stop();
  // "late" is the newest by time, although "early" came last.
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug), Contains("marking event redundant").Times(2));
}

// Workers.

// Handles errors only.
class ErrorConsumer final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  static constexpr MessageTypes kHandledTypes = MessageTypes::only(kTypeError);
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit ErrorConsumer(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  bool handleMessage(const TWReportingSessionMessage& message) override {
    handled.push_back(message.type);
    return false;
  }

  std::vector<AudioEventType> handled;
};
const TWReportingSessionWorkerClass ErrorConsumer::kWorkerClass =
    workerClassOf<ErrorConsumer>("ErrorConsumer");

TEST_F(RedundancyTest, AConsumerGetsOnlyMessagesOfTheTypesThatItHandles) {
  useWorkers({&ErrorConsumer::kWorkerClass});
  session = makeSession();
  session->start();
  for (const AudioEventType type : {kTypeStart, kTypeError, kTypeUnknown, kTypeError}) {
    session->sendMessage(messageAt(test.clock.now(), {{"a", 1}}, 4, type));
  }
  const auto& worker = dynamic_cast<const ErrorConsumer&>(*session->consumingMessageWorkers().front());
  EXPECT_THAT(worker.handled, ElementsAre(kTypeError, kTypeError));
}

TEST(MessageTypesTest, HoldsEachTypeByItself) {
  for (AudioEventType held = 0; held < 63; ++held) {
    for (AudioEventType type = 0; type < 63; ++type) {
      EXPECT_EQ(MessageTypes::only(held).contains(type), type == held);
    }
    EXPECT_FALSE(MessageTypes::only(held).contains(kTypeUnknown));
    EXPECT_TRUE(MessageTypes::all().contains(held));
  }
  EXPECT_TRUE(MessageTypes::all().contains(kTypeUnknown));
}

class WorkerTest : public ReportingTest {
 protected:
  WorkerTest() : ReportingTest(testWorkerClasses()) {}

  // What the workers have done since the last call.
  std::vector<std::string> takeEvents() { return journal.take(); }

  TestWorkerJournal journal;
};

TEST_F(WorkerTest, TheRegistryListsTheClassesByTheirRoles) {
  const TWReportingSessionWorkerRegistry registry(testWorkerClasses());
  EXPECT_THAT(namesOf(registry.allClasses()),
              ElementsAre("Trace", "Volume", "Gather", "Summary", "Input", "Metricon", "Energybook",
                          "MemoryLog", "Diagwire", "DriverSnapshot", "SystemMonitor", "Capsa", "DP",
                          "JsonFile", "Rtc", "IssueDraft"));
  EXPECT_EQ(registry.validClasses(), registry.allClasses());
  EXPECT_THAT(namesOf(registry.consumerClasses()),
              ElementsAre("Summary", "Metricon", "Energybook", "MemoryLog", "Diagwire", "Capsa", "DP", "Rtc",
                          "IssueDraft"));
  EXPECT_THAT(namesOf(registry.producerClasses()),
              ElementsAre("Volume", "Gather", "Summary", "Input", "DriverSnapshot", "SystemMonitor"));
  EXPECT_THAT(namesOf(registry.startOnInitClasses()),
              ElementsAre("Metricon", "Energybook", "MemoryLog", "Diagwire"));
}

TEST_F(WorkerTest, AClassWhoseInstancesCannotBeMadeIsLeftOut) {
  static constexpr TWReportingSessionWorkerClass kBroken{"Broken", true, true, true, true, nullptr};
  const TWReportingSessionWorkerRegistry registry({&kBroken});
  EXPECT_THAT(registry.allClasses(), SizeIs(1));
  EXPECT_THAT(registry.validClasses(), IsEmpty());
  EXPECT_THAT(registry.consumerClasses(), IsEmpty());
  EXPECT_THAT(registry.producerClasses(), IsEmpty());
  EXPECT_THAT(registry.startOnInitClasses(), IsEmpty());
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug),
              ElementsAre("Worker does not implement initWithSession! Broken"));
}

TEST_F(WorkerTest, TheDaemonsClassesAreInTheRegistrysOrder) {
  EXPECT_THAT(namesOf(allWorkerClasses()),
              ElementsAre("TWReportingSessionTraceWorker", "TWReportingSessionVolumeMessagesWorker",
                          "TWReportingSessionGatherMessagesWorker", "TWReportingSessionSummaryWorker",
                          "TWReportingSessionInputMessagesWorker", "TWReportingSessionMetriconWorker",
                          "TWReportingSessionEnergybookWorker", "TWReportingSessionMemoryLogWorker",
                          "TWReportingSessionDiagwireWorker", "TWReportingSessionDriverSnapshotWorker",
                          "TWReportingSessionSystemMonitorWorker", "TWReportingSessionCapsaWorker",
                          "TWReportingSessionDPWorker", "TWReportingSessionSummaryJsonFileWorker",
                          "TWReportingSessionRtcWorker", "TWReportingSessionIssueDraftWorker"));
}

TEST_F(WorkerTest, WhatShowsTheDeviceAsItIsOrTellsOthersIsLeftOutOfPlayedSessions) {
  std::vector<const TWReportingSessionWorkerClass*> left;
  for (const TWReportingSessionWorkerClass* workerClass : allWorkerClasses()) {
    if (workerClass->isForLiveSessions) left.push_back(workerClass);
  }
  EXPECT_THAT(namesOf(left),
              ElementsAre("TWReportingSessionTraceWorker", "TWReportingSessionMemoryLogWorker",
                          "TWReportingSessionDriverSnapshotWorker", "TWReportingSessionSystemMonitorWorker",
                          "TWReportingSessionCapsaWorker", "TWReportingSessionDPWorker",
                          "TWReportingSessionRtcWorker", "TWReportingSessionIssueDraftWorker"));
}

TEST_F(WorkerTest, TheRegistryIsFilledOnce) {
  makeSession();
  const auto* classes = &TWReportingSession::getAllWorkerClasses();
  makeSession();
  EXPECT_EQ(classes, &TWReportingSession::getAllWorkerClasses());
}

TEST_F(WorkerTest, ANewSessionHasTheStartOnInitWorkersStarted) {
  const auto session = makeSession();
  EXPECT_THAT(namesOf(session->messageWorkers()),
              ElementsAre("Metricon", "Energybook", "MemoryLog", "Diagwire"));
  for (const auto& worker : session->messageWorkers()) EXPECT_TRUE(worker->started);
  EXPECT_THAT(takeEvents(),
              ElementsAre("Metricon started", "Energybook started", "MemoryLog started", "Diagwire started"));
}

TEST_F(WorkerTest, StartOnInitWorkersSeeMessagesSentBeforeStart) {
  const auto session = makeSession();
  takeEvents();
  session->sendMessage(message({{"a", 1}}));
  EXPECT_THAT(takeEvents(),
              ElementsAre("Metricon got a=1", "Energybook got a=1", "MemoryLog got a=1", "Diagwire got a=1"));
}

TEST_F(WorkerTest, AtStartConsumersStartFirstThenProducersThenTheRest) {
  const auto session = makeSession();
  takeEvents();
  session->start();
  EXPECT_THAT(takeEvents(), ElementsAre("Summary started", "Capsa started", "DP started", "Rtc started",
                                        "IssueDraft started", "Volume started", "Gather started",
                                        "Input started", "DriverSnapshot started", "SystemMonitor started",
                                        "Trace started", "JsonFile started"));
}

TEST_F(WorkerTest, AfterStartEveryClassHasExactlyOneWorkerAlsoAfterASecondStart) {
  const auto session = makeSession();
  session->start();
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 16U);
  EXPECT_THAT(namesOf(session->messageWorkers()),
              ElementsAre("Metricon", "Energybook", "MemoryLog", "Diagwire", "Trace", "Volume", "Gather",
                          "Summary", "Input", "DriverSnapshot", "SystemMonitor", "Capsa", "DP", "JsonFile",
                          "Rtc", "IssueDraft"));
  EXPECT_EQ(namesOf(session->initializedWorkerClasses()), namesOf(session->messageWorkers()));
}

TEST_F(WorkerTest, AtStopProducersStopFirstThenConsumersThenTheRest) {
  const auto session = makeSession();
  session->start();
  takeEvents();
  session->stop();
  EXPECT_THAT(takeEvents(), ElementsAre("Volume stopped", "Gather stopped", "Summary stopped",
                                        "Input stopped", "DriverSnapshot stopped", "SystemMonitor stopped",
                                        "Metricon stopped", "Energybook stopped", "MemoryLog stopped",
                                        "Diagwire stopped", "Capsa stopped", "DP stopped", "Rtc stopped",
                                        "IssueDraft stopped", "Trace stopped", "JsonFile stopped"));
  for (const auto& worker : session->messageWorkers()) EXPECT_FALSE(worker->started);
}

TEST_F(WorkerTest, AStopWithoutAStartStopsNoWorker) {
  const auto session = makeSession();
  takeEvents();
  session->stop();
  EXPECT_THAT(takeEvents(), IsEmpty());
}

TEST_F(WorkerTest, WorkersAreKeptAndStartedAgain) {
  const auto session = makeSession();
  session->start();
  const auto workers = session->messageWorkers();
  session->stop();
  takeEvents();
  session->start();
  EXPECT_EQ(session->messageWorkers(), workers);
  EXPECT_THAT(takeEvents(), AllOf(SizeIs(16), Each(EndsWith("started"))));
}

TEST_F(WorkerTest, ARedundantMessageReachesOnlyWorkersThatWantIt) {
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"a", 1}}));
  takeEvents();
  session->sendMessage(message({{"a", 1}, {"systemuptime_sec", 5}}));
  EXPECT_THAT(takeEvents(), ElementsAre("MemoryLog got a=1 redundant", "Capsa got a=1 redundant"));
  EXPECT_EQ(session->previousValues().integer("systemuptime_sec"), 5);
}

TEST_F(WorkerTest, AMessageWithDestinationsReachesOnlyThem) {
  const auto session = makeSession();
  session->start();
  takeEvents();
  const auto record = message({{"a", 1}});
  record->details.setDestinationWorkers(
      {testWorkerClass("Rtc"), testWorkerClass("JsonFile")});  // the latter is no consumer
  session->sendMessage(record);
  EXPECT_THAT(takeEvents(), ElementsAre("Rtc got a=1"));
}

TEST_F(WorkerTest, AStoppedWorkerGetsNothingWhileTheSessionIsStopped) {
  const auto session = makeSession();
  session->start();
  session->stop();
  takeEvents();
  session->sendMessage(message({{"a", 1}}));
  EXPECT_THAT(takeEvents(), IsEmpty());
}

TEST_F(WorkerTest, AMessageDerivedAtStopReachesTheRunningConsumersAndIsStored) {
  const auto session = makeSession();
  session->start();
  takeEvents();
  std::size_t storedAtTheEnd = 0;
  journal.onEvent("Volume stopped", [&] { session->sendMessage(message({{"a", "derived"}}, 14, 11)); });
  journal.onEvent("JsonFile stopped", [&] { storedAtTheEnd = session->messages().size(); });
  session->stop();
  EXPECT_THAT(takeEvents(), Contains("Metricon got a=derived"));
  EXPECT_EQ(storedAtTheEnd, 3U);  // start, stop, derived
}

TEST_F(WorkerTest, MessagesAreSortedByTimeBeforeTheWorkersStop) {
  const auto session = makeSession();
  session->start();
  const double now = test.clock.now();
  session->sendMessage(messageAt(now - 5, {{"a", "second"}}));
  session->sendMessage(messageAt(now - 9, {{"a", "first"}}));
  std::vector<std::string> order;
  journal.onEvent("Volume stopped", [&] { order = textsUnder("a", session->messages()); });
  session->stop();
  EXPECT_THAT(order, ElementsAre("first", "second", "(null)", "(null)"));
}

TEST_F(WorkerTest, AWorkerWhoseStartFailsGetsNothingAndIsTriedAgainAtTheNextStart) {
  journal.failStart("Capsa");
  const auto session = makeSession();
  session->start();
  EXPECT_THAT(takeEvents(), Contains("Capsa failed to start"));
  session->sendMessage(message({{"a", 1}}));
  EXPECT_THAT(takeEvents(), Not(Contains("Capsa got a=1")));
  session->stop();
  EXPECT_THAT(takeEvents(), Not(Contains("Capsa stopped")));
  session->start();
  EXPECT_THAT(takeEvents(), Contains("Capsa failed to start"));
}

TEST_F(WorkerTest, AWorkerThatIsNotMadeIsTriedAgainAtTheNextStart) {
  journal.failToMake("Rtc");
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 15U);
  EXPECT_THAT(
      test.log.textsOf("twrr", LogLevel::kDebug),
      Contains("TWReportingSessionWorker failed to initialize. action=failure worker=Rtc reporterID=77"));
  session->stop();
  journal.failToMake("");
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 16U);
}

TEST_F(WorkerTest, AWorkerWithoutAStartFunctionCountsAsStarted) {
  const auto session = makeSession();
  session->start();
  EXPECT_THAT(
      test.log.textsOf("twrr", LogLevel::kDebug),
      AllOf(Contains("TWReportingSessionWorker action=start worker=Summary started=YES reporterID=77"),
            Not(Contains(HasSubstr("action=start worker=JsonFile")))));
  EXPECT_TRUE(session->messageWorkers()[13]->started);
}

TEST_F(WorkerTest, ASingleMessageSessionGetsOnlyWorkersThatHandleOne) {
  const auto session = makeSession();
  session->setSingleMessageSession(true);
  session->start();
  // The memory-log worker was made with the session, before it was marked.
  EXPECT_THAT(namesOf(session->messageWorkers()),
              ElementsAre("Metricon", "Energybook", "MemoryLog", "Diagwire", "Capsa", "Rtc", "IssueDraft"));
  EXPECT_THAT(
      test.log.textsOf("twrr", LogLevel::kDebug),
      Contains("Skipping TWReportingSessionWorker for single message session. action=skipped worker=Trace "
               "reporterID=77"));
}

TEST_F(WorkerTest, ASingleMessageSessionMakesOnlyWorkersThatHandleOneAtItsStart) {
  useWorkers(testWorkerClassesWithoutStartOnInit());
  const auto session = makeSession();
  session->setSingleMessageSession(true);
  session->start();
  EXPECT_THAT(namesOf(session->messageWorkers()), ElementsAre("Capsa", "Rtc", "IssueDraft"));
}

TEST_F(WorkerTest, EachStepOfAWorkersLifeIsLogged) {
  const auto session = makeSession();
  session->sendMessage(message({{"a", 1}}));
  session->start();
  session->stop();
  const auto lines = test.log.textsOf("twrr", LogLevel::kDebug);
  for (const char* line :
       {"Initializing TWReportingSessionWorker. action=init worker=Metricon reporterID=77",
        "TWReportingSessionWorker action=added worker=Metricon reporterID=77",
        "TWReportingSessionWorker action=start worker=Metricon started=YES reporterID=77",
        "TWReportingSessionWorker action=handleMessage worker=Metricon reporterID=77",
        "TWReportingSessionWorker already initialized. action=skipped worker=Metricon reporterID=77",
        "TWReportingSessionWorker action=stop worker=Metricon reporterID=77"}) {
    EXPECT_THAT(lines, Contains(line));
  }
}

TEST_F(WorkerTest, AWorkerMaySendWhileItHandlesAMessage) {
  const auto session = makeSession();
  session->start();
  takeEvents();
  journal.onEvent("Summary got a=1", [&] { session->sendMessage(message({{"a", 2}})); });
  session->sendMessage(message({{"a", 1}}));
  EXPECT_THAT(takeEvents(), AllOf(Contains("Metricon got a=2"), Contains("Metricon got a=1")));
}

TEST_F(WorkerTest, WorkersDoNotKeepTheirSessionAlive) {
  auto session = makeSession();
  session->start();
  const auto workers = session->messageWorkers();
  session.reset();
  EXPECT_TRUE(workers.front()->session.expired());
}

// The budget.

class BudgetTest : public ReportingTest {
 protected:
  std::shared_ptr<TWReportingSession> makeSessionWithin(std::size_t bytes) {
    budget = std::make_shared<KeptBytesBudget>(bytes);
    return TWReportingSession::initWithID(77, {1}, budget);
  }

  static std::string unkept(std::size_t count) {
    return "messages delivered but not kept: count=" + std::to_string(count) + " reporterID=77";
  }

  std::shared_ptr<KeptBytesBudget> budget;
};

TEST_F(BudgetTest, MessagesOverTheBudgetAreDeliveredButNotKeptAndLogged) {
  TestWorkerJournal journal;
  useWorkers(testWorkerClasses());
  const auto session = makeSessionWithin(20'000);
  session->start();
  const std::string text(3'000, 'x');
  for (int n = 0; n < 10; ++n) session->sendMessage(message({{"a", n}, {"text", text}}));
  EXPECT_LT(session->messages().size(), 11U);
  EXPECT_GT(session->messages().size(), 2U);
  EXPECT_LE(budget->used(), 20'000U);
  EXPECT_THAT(journal.take(), Contains("Metricon got a=9"));
  EXPECT_EQ(session->totalMessageCount(), 10U);

  const std::size_t kept = session->messages().size() - 1;  // without the start message
  EXPECT_GE(kept, 1U);
  session->stop();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError),
              ElementsAre(HasSubstr("delivered but not kept. reporterID=77"), unkept(10 - kept)));
}

// A message takes bytes as a stored message and as previous values. It is counted only once when neither
// fits.
TEST_F(BudgetTest, AnUnkeptMessageIsCountedOnce) {
  const auto session = makeSessionWithin(2'000);
  session->start();
  for (int n = 0; n < 11; ++n) session->sendMessage(message({{"a", n}, {"text", std::string(3'000, 'x')}}));
  session->stop();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), Contains(unkept(11)));
}

TEST_F(BudgetTest, AMessageOfANewKindTakesMoreForTheIndexOfTheNewest) {
  const auto session = makeSessionWithin(100'000);
  const auto bytesOf = [&](const ValueMap& payload, AudioEventType type) {
    const std::size_t before = budget->used();
    session->sendMessage(message(payload, 4, type));
    return budget->used() - before;
  };
  (void)bytesOf({{"a", 1}}, kTypeStart);
  const std::size_t known = bytesOf({{"a", 2}}, kTypeStart);
  EXPECT_GT(bytesOf({{"a", 3}}, kTypeSetup), known + 64);
  session->start();
  session->stop();
  EXPECT_EQ(budget->used(), session->previousValues().bytes());
}

TEST_F(BudgetTest, ARedundantMessageIsNotCountedAsUnkept) {
  const auto session = makeSessionWithin(6'000);
  session->start();
  const ValueMap payload{{"text", std::string(1'800, 'x')}};
  for (int n = 0; n < 5; ++n) session->sendMessage(message(payload));
  EXPECT_EQ(session->redundantMessageCount(), 4U);
  session->stop();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), Not(Contains(HasSubstr("count="))));
}

TEST_F(BudgetTest, ANeverStartedSessionLogsUnkeptMessagesAtItsStop) {
  const auto session = makeSessionWithin(2'000);
  session->sendMessage(message({{"text", std::string(3'000, 'x')}}));
  session->stop();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), Contains(unkept(1)));
}

TEST_F(BudgetTest, ASessionLogsAtItsEndTheUnkeptMessagesNotLoggedYet) {
  auto session = makeSessionWithin(2'000);
  session->start();
  session->sendMessage(message({{"a", 1}, {"text", std::string(3'000, 'x')}}));
  session->sendMessage(message({{"a", 2}, {"text", std::string(3'000, 'x')}}));
  session->stop();
  session->sendMessage(message({{"a", 3}, {"text", std::string(3'000, 'x')}}));
  test.log.clear();
  session.reset();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), ElementsAre(unkept(1)));
}

TEST_F(BudgetTest, AStopGivesBackTheBytesOfTheMessagesAndTheReleaseAllBytes) {
  auto session = makeSessionWithin(1'000'000);
  session->start();
  session->sendMessage(message({{"a", std::string(10'000, 'x')}}));
  EXPECT_GT(budget->used(), 20'000U);  // the message and the previous values
  session->stop();
  EXPECT_LT(budget->used(), 20'000U);
  EXPECT_GT(budget->used(), 10'000U);
  session.reset();
  EXPECT_EQ(budget->used(), 0U);
}

TEST_F(BudgetTest, ReplacedPreviousValuesAreGivenBack) {
  const auto session = makeSessionWithin(100'000);
  for (int n = 0; n < 1'000; ++n) {
    session->sendMessage(message({{"a", std::string(1'000, static_cast<char>('a' + n % 26))}}));
    session->start();
    session->stop();
  }
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), IsEmpty());
}

TEST_F(BudgetTest, AConfigurationThatDoesNotFitChangesNothing) {
  const auto session = makeSessionWithin(2'000);
  const ValueMap small{{"a", 1}};
  const ValueMap large{{"a", std::string(4'000, 'x')}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&small));
  EXPECT_FALSE(session->updateConfigurationWithContentsOfConfiguration(&large));
  EXPECT_EQ(session->configuration(), small);
}

}  // namespace
}  // namespace tonewerk
