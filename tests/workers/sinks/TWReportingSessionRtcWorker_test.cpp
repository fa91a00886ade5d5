// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionRtcWorker.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <thread>

#include "support/ReportingTest.h"
#include "workers/sinks/RtcReporter.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

using Worker = TWReportingSessionRtcWorker;

constexpr AudioServiceType kTelephony = 2;

class TWReportingSessionRtcWorkerTest : public ReportingTest {
 protected:
  TWReportingSessionRtcWorkerTest() : ReportingTest({&Worker::kWorkerClass}) {}

  std::shared_ptr<TWReportingSession> makeSessionFor(AudioServiceType type, ReporterID reporterID = 77) {
    auto made = makeSession(reporterID);
    made->setServiceType(type);
    return made;
  }
  void run() { test.queues.runAll(); }
  void startAndRun() {
    session->start();
    run();
  }
  void send(ValueMap payload, AudioEventCategory category = 4, AudioEventType type = 0) {
    session->sendMessage(message(std::move(payload), category, type));
  }
  // Stops the session and returns the summary that was sent.
  ValueMap stopAndTakeSummary() {
    session->stop();
    run();
    const auto messages = service(0).messages;
    return messages.empty() ? ValueMap() : messages.back().payload;
  }
  // From now on the queue's thread has no room, and does not move until run().
  void fillQueue() {
    context->linkReportQueues().makeStrand()->submit(SinkQueue::Limits().waitingBytes, [] {});
  }
  MemoryLinkReport::Session service(std::size_t at) const { return test.linkReport.session(at); }
  std::vector<std::string> texts() const { return test.log.textsOf("twri"); }
  std::vector<std::string> errors() const { return test.log.textsOf("twri", LogLevel::kError); }
  std::vector<std::string> defaults() const { return test.log.textsOf("twri", LogLevel::kDefault); }

  std::shared_ptr<TWReportingSession> session = makeSessionFor(kTelephony);
};

TEST_F(TWReportingSessionRtcWorkerTest, IsAConsumerMadeAtStartAlsoInSingleMessageSessions) {
  const auto& workerClass = Worker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_TRUE(workerClass.handleSingleMessageSession);
  EXPECT_THAT(session->messageWorkers(), IsEmpty());
  session->start();
  ASSERT_THAT(session->consumingMessageWorkers(), SizeIs(1));
  EXPECT_FALSE(
      std::dynamic_pointer_cast<Worker>(session->consumingMessageWorkers()[0])->handleRedundantMessages());
}

TEST_F(TWReportingSessionRtcWorkerTest, ASessionOfTheTestServiceGetsNoWorker) {
  session->setServiceType(kServiceTest);
  startAndRun();
  EXPECT_THAT(session->messageWorkers(), IsEmpty());
  EXPECT_EQ(test.linkReport.count(), 0U);
}

TEST_F(TWReportingSessionRtcWorkerTest, DoesNotStartWhenTheSessionHasBecomeOneOfTheTestService) {
  const auto worker = Worker::initWithSession(session);
  session->setServiceType(kServiceTest);
  EXPECT_EQ(worker->start(), false);
  run();
  EXPECT_EQ(test.linkReport.count(), 0U);
}

TEST_F(TWReportingSessionRtcWorkerTest, TheWorkQueueOnlyQueues) {
  session->start();
  send({{"a", 1}});
  session->stop();
  EXPECT_EQ(test.linkReport.count(), 0U);
  EXPECT_THAT(texts(), IsEmpty());
  const ManualSerialQueue* queue = test.queues.find("com.orvane.tonewerk.session.linkreport");
  ASSERT_NE(queue, nullptr);
  EXPECT_EQ(queue->priority(), QueuePriority::kUtility);
  run();
  EXPECT_THAT(service(0).messages, SizeIs(2));
}

TEST_F(TWReportingSessionRtcWorkerTest, AMessageThatNothingIsAheadOfIsSentAtOnce) {
  startAndRun();
  send({{"a", 1}});
  ASSERT_THAT(service(0).messages, SizeIs(1));
  EXPECT_EQ(service(0).messages[0].payload.integer("a"), 1);
}

TEST_F(TWReportingSessionRtcWorkerTest, AMessageForASlowServiceGoesToTheOtherThread) {
  test.linkReport.setQuick(false);
  startAndRun();
  send({{"a", 1}});
  EXPECT_THAT(service(0).messages, IsEmpty());
  run();
  EXPECT_THAT(service(0).messages, SizeIs(1));
}

TEST_F(TWReportingSessionRtcWorkerTest, MessagesStayInOrderBehindTheStart) {
  startAndRun();
  send({{"a", 1}});
  session->stop();
  session->start();
  send({{"a", 2}});
  EXPECT_THAT(service(0).messages, SizeIs(1));
  run();
  ASSERT_THAT(service(0).messages, SizeIs(2));  // the other one is the summary
  ASSERT_THAT(service(1).messages, SizeIs(1));
  EXPECT_EQ(service(1).messages[0].payload.integer("a"), 2);
}

TEST_F(TWReportingSessionRtcWorkerTest, AStopWithoutBackendsStillLogsItsCopiesForDebugging) {
  test.linkReport.answerAtOnce(std::nullopt);
  startAndRun();
  send({{"a", 1}});
  const std::size_t stored = session->messages().size() + 1;  // and that of the stop
  session->stop();
  run();
  const std::vector<std::string> lines = test.log.textsOf("twrr");
  EXPECT_EQ(std::count(lines.begin(), lines.end(), "copyWithZone"), static_cast<std::ptrdiff_t>(stored));
}

TEST_F(TWReportingSessionRtcWorkerTest, AStopWithoutBackendsOnlyLogs) {
  test.log.setThreshold(LogLevel::kDefault);
  test.linkReport.answerAtOnce(std::nullopt);
  startAndRun();
  send({{"a", 1}});
  session->stop();
  EXPECT_THAT(defaults(), ElementsAre("Session never started. handleMessage", "Session never started. stop"));
  run();
  EXPECT_THAT(defaults(), SizeIs(2));
  EXPECT_THAT(service(0).messages, IsEmpty());
}

TEST_F(TWReportingSessionRtcWorkerTest, AStartWithBackendsAfterOneWithoutSendsItsSummary) {
  test.linkReport.answerAtOnce(std::nullopt);
  startAndRun();
  session->stop();
  test.linkReport.answerAtOnce(std::vector<std::string>{"memory"});
  session->start();
  send({{"a", 1}});
  EXPECT_EQ(stopAndTakeSummary().size(), 0U);  // of the first one
  ASSERT_THAT(service(1).messages, SizeIs(2));
  EXPECT_EQ(service(1).messages[1].payload.text("a"), "1");
}

TEST_F(TWReportingSessionRtcWorkerTest, ThousandsOfSessionsShareOneQueuesThread) {
  std::vector<std::shared_ptr<TWReportingSession>> sessions;
  for (ReporterID id = 100; id < 200; ++id) {
    sessions.push_back(makeSessionFor(kTelephony, id));
    sessions.back()->start();
  }
  EXPECT_THAT(test.queues.names(), ElementsAre("com.orvane.tonewerk.session.linkreport"));
}

TEST_F(TWReportingSessionRtcWorkerTest, DescribesTheSessionToTheService) {
  startAndRun();
  EXPECT_EQ(service(0).sessionInfo, (ValueMap{{"kLinkReportSessionInfoClientType", 19},
                                              {"kLinkReportSessionInfoClientVersion", 2.1},
                                              {"kLinkReportSessionInfoSessionID", 77},
                                              {"kLinkReportSessionInfoBatchEvent", true},
                                              {"kLinkReportSessionInfoHierarchyToken", "root/1"},
                                              {"kLinkReportSessionInfoContainsRealtimeEvents", false}}));
  EXPECT_EQ(service(0).userInfo, (ValueMap{{"kLinkReportUserInfoClientName", "com.orvane.tonewerk"},
                                           {"TWReportingSessionID", 77},
                                           {"kLinkReportUserInfoServiceName", "telephony_session"}}));
}

TEST_F(TWReportingSessionRtcWorkerTest, AddsTheConfigurationToTheUserInfoAndTheApplicationToTheSessionInfo) {
  const ValueMap configuration{
      {"HostApplicationDisplayID", "org.example.player"}, {"TWReportingSessionID", "mine"}, {"extra", 1}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&configuration));
  startAndRun();
  EXPECT_EQ(service(0).sessionInfo.text("kLinkReportSessionInfoClientBundleID"), "org.example.player");
  EXPECT_EQ(service(0).userInfo, (ValueMap{{"kLinkReportUserInfoClientName", "com.orvane.tonewerk"},
                                           {"TWReportingSessionID", "mine"},
                                           {"kLinkReportUserInfoServiceName", "telephony_session"},
                                           {"HostApplicationDisplayID", "org.example.player"},
                                           {"extra", 1}}));
}

TEST_F(TWReportingSessionRtcWorkerTest, TakesTheConfigurationAsItWasAtTheStart) {
  session->start();
  const ValueMap later{{"extra", 1}};
  EXPECT_TRUE(session->updateConfigurationWithContentsOfConfiguration(&later));
  run();
  EXPECT_FALSE(service(0).userInfo.contains("extra"));
}

TEST_F(TWReportingSessionRtcWorkerTest, ASingleMessageSessionGoesUnderTheBareServiceName) {
  session->setSingleMessageSession(true);
  startAndRun();
  EXPECT_EQ(service(0).userInfo.text("kLinkReportUserInfoServiceName"), "telephony");
}

TEST_F(TWReportingSessionRtcWorkerTest, AnInternalBuildDescribesTheSessionInTheSameWay) {
  makeInternalBuild();
  startAndRun();
  EXPECT_EQ(service(0).userInfo.integer("TWReportingSessionID"), 77);
}

TEST_F(TWReportingSessionRtcWorkerTest, OnlyUseOfTheInterfaceIsReportedInRealTime) {
  for (AudioServiceType type = 0; type < 14; ++type) {
    EXPECT_EQ(Worker::shouldBatchLinkReportEventsForServiceType(type), type != 12) << type;
  }
  EXPECT_TRUE(Worker::shouldBatchLinkReportEventsForServiceType(kServiceUnknown));
  session->setServiceType(12);
  startAndRun();
  EXPECT_FALSE(service(0).sessionInfo.boolean("kLinkReportSessionInfoBatchEvent"));
  EXPECT_TRUE(service(0).sessionInfo.boolean("kLinkReportSessionInfoContainsRealtimeEvents"));
}

TEST_F(TWReportingSessionRtcWorkerTest, WithoutATokenTheSessionStaysSilent) {
  test.linkReport.giveNoTokens();
  startAndRun();
  send({{"a", 1}});
  session->stop();
  run();
  EXPECT_EQ(test.linkReport.count(), 0U);
  EXPECT_THAT(errors(), ElementsAre("newHierarchyTokenFromParentToken returned nil. Will skip rtc for this "
                                    "session. start"));
  EXPECT_THAT(defaults(), ElementsAre("Session never started. handleMessage", "Session never started. stop"));
}

TEST_F(TWReportingSessionRtcWorkerTest, ContinuesWhenTheBackendsAreKnownAtOnce) {
  test.linkReport.answerAtOnce({{"one", "two"}});
  startAndRun();
  EXPECT_THAT(texts(), ElementsAre("entering linkreport start", "list of backends (one, two)",
                                   "waiting to find backends", "continuing with backends!"));
  EXPECT_EQ(test.timers.count(), 0U);
}

TEST_F(TWReportingSessionRtcWorkerTest, MessagesAndTheStopWaitBehindTheSearchForBackends) {
  test.linkReport.answerLater();
  startAndRun();
  send({{"a", 1}});
  session->stop();
  run();
  test.clock.advance(8.9);
  run();
  EXPECT_THAT(service(0).messages, IsEmpty());
  EXPECT_TRUE(service(0).isOpen);

  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_THAT(service(0).messages, SizeIs(2));
  EXPECT_EQ(service(0).messages[0].payload.integer("a"), 1);
  EXPECT_EQ(service(0).flushCount, 1U);
  EXPECT_FALSE(service(0).isOpen);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionRtcWorkerTest, AnAnswerFromTheServicesOwnThreadIsTaken) {
  test.linkReport.answerLater();
  startAndRun();
  send({{"a", 1}});
  run();
  std::thread([this] { test.linkReport.answer(0, {{"fleet"}}); }).join();
  run();
  EXPECT_THAT(service(0).messages, SizeIs(1));
}

TEST_F(TWReportingSessionRtcWorkerTest, AnotherSessionDoesNotWaitForThisOnesBackends) {
  test.linkReport.answerLater();
  startAndRun();
  test.linkReport.answerAtOnce({{"memory"}});
  const auto other = makeSessionFor(kTelephony, 78);
  other->start();
  other->sendMessage(message({{"b", 2}}));
  run();
  EXPECT_THAT(service(1).messages, SizeIs(1));
}

TEST_F(TWReportingSessionRtcWorkerTest, AfterNineSecondsWithoutBackendsMessagesAreLoggedInstead) {
  test.linkReport.answerLater();
  startAndRun();
  send({{"a", 1}});
  session->stop();
  run();
  EXPECT_THAT(defaults(), IsEmpty());
  test.clock.advance(9.0);
  run();
  EXPECT_THAT(errors(), ElementsAre("timed out waiting for backends"));
  EXPECT_THAT(defaults(), ElementsAre("Session never started. handleMessage", "Session never started. stop"));
  EXPECT_THAT(service(0).messages, IsEmpty());
  EXPECT_EQ(service(0).flushCount, 0U);
  EXPECT_EQ(test.timers.count(), 0U);
}

TEST_F(TWReportingSessionRtcWorkerTest, AfterALateAnswerLaterMessagesAreSent) {
  test.linkReport.answerLater();
  startAndRun();
  test.clock.advance(9.0);
  run();
  send({{"a", 1}});
  run();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  send({{"b", 2}});
  run();
  ASSERT_THAT(service(0).messages, SizeIs(1));
  EXPECT_TRUE(service(0).messages[0].payload.contains("b"));
}

TEST_F(TWReportingSessionRtcWorkerTest, AnAnswerToAnEarlierStartChangesNothing) {
  test.linkReport.answerLater();
  startAndRun();
  session->stop();
  run();
  test.clock.advance(9.0);
  startAndRun();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  send({{"a", 1}});
  run();
  EXPECT_THAT(service(0).messages, IsEmpty());
  EXPECT_THAT(service(1).messages, IsEmpty());
  test.linkReport.answer(1, {{"fleet"}});
  run();
  EXPECT_THAT(service(1).messages, SizeIs(1));
}

TEST_F(TWReportingSessionRtcWorkerTest, WithoutBackendsNothingIsSent) {
  test.linkReport.answerAtOnce(std::nullopt);
  startAndRun();
  send({{"a", 1}});
  session->stop();
  run();
  EXPECT_THAT(errors(), ElementsAre("no backends found, this session won't get sent to the server"));
  EXPECT_THAT(test.log.textsOf("twri", LogLevel::kDebug), Contains("failed to find backend"));
  EXPECT_THAT(defaults(), ElementsAre("Session never started. handleMessage", "Session never started. stop"));
  EXPECT_THAT(service(0).messages, IsEmpty());
}

TEST_F(TWReportingSessionRtcWorkerTest, TheBackendsAnswerDoesNotChangeTheSessionsFlag) {
  test.linkReport.answerLater();
  startAndRun();
  session->stop();
  run();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_FALSE(session->messageWorkers()[0]->started);
  startAndRun();
  EXPECT_EQ(test.linkReport.count(), 2U);
}

TEST_F(TWReportingSessionRtcWorkerTest, SendsTheBaseCategoryTheTypeAndThePayload) {
  startAndRun();
  send({{"a", 1}}, 0x20000004, 6);
  run();
  ASSERT_THAT(service(0).messages, SizeIs(1));
  EXPECT_EQ(service(0).messages[0].category, 4);
  EXPECT_EQ(service(0).messages[0].type, 6);
  EXPECT_EQ(service(0).messages[0].payload.integer("a"), 1);
  EXPECT_EQ(Worker::retrieveLinkReportCategoryFromCategory(kCategoryUnknown), 65535);
}

TEST_F(TWReportingSessionRtcWorkerTest, LeavesTheTimeStampOutAndDoesNotChangeTheSessionsOwnRecord) {
  startAndRun();
  send({{"a", 1}, {"twreporting_timestamp", ManualClock::kStart}});
  const ValueMap summary = stopAndTakeSummary();
  EXPECT_FALSE(service(0).messages[0].payload.contains("twreporting_timestamp"));
  EXPECT_FALSE(summary.contains("twreporting_timestamp"));
  EXPECT_EQ(summary.text("a"), "1");
}

TEST_F(TWReportingSessionRtcWorkerTest, AnInternalBuildSendsTheTimeStamps) {
  makeInternalBuild();
  startAndRun();
  send({{"a", 1}, {"twreporting_timestamp", ManualClock::kStart}});
  send({{"a", 2}, {"twreporting_timestamp", ManualClock::kStart + 1}});
  const ValueMap summary = stopAndTakeSummary();
  EXPECT_EQ(service(0).messages[0].payload.number("twreporting_timestamp"), ManualClock::kStart);
  EXPECT_EQ(summary.text("twreporting_timestamp"), "1763633880,1763633881");
}

TEST_F(TWReportingSessionRtcWorkerTest, LaterChangesOfAMessageAreNotSent) {
  startAndRun();
  const auto sent = message({{"a", 1}});
  session->sendMessage(sent);
  sent->message.set("a", 2);
  run();
  EXPECT_EQ(service(0).messages[0].payload.integer("a"), 1);
}

TEST_F(TWReportingSessionRtcWorkerTest, LogsWhyAMessageCouldNotBeSentAndContinues) {
  test.linkReport.failSending("the disk is full");
  startAndRun();
  send({{"a", 1}});
  session->stop();
  run();
  EXPECT_THAT(errors(), ElementsAre("error sending message the disk is full",
                                    "error sending message the disk is full"));
  EXPECT_EQ(service(0).flushCount, 1U);
}

TEST_F(TWReportingSessionRtcWorkerTest, AFailureWithoutAReasonIsNotLogged) {
  test.linkReport.failSending("");
  startAndRun();
  send({{"a", 1}});
  run();
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionRtcWorkerTest, SendsASummaryOfEveryKeyWhenTheSessionStops) {
  startAndRun();
  send({{"a", 1}});
  send({{"a", 2}, {"b", "text"}});
  const ValueMap summary = stopAndTakeSummary();
  EXPECT_EQ(service(0).messages.back().category, 65535);
  EXPECT_EQ(service(0).messages.back().type, 65535);
  EXPECT_EQ(summary.text("TW_Session_Summary_Event"), "2");
  EXPECT_EQ(summary.text("a"), "1,2");
  EXPECT_EQ(summary.text("b"), "text");
  EXPECT_EQ(summary.text("audiotag"), "PlaybackGeneric,PlaybackGeneric");
  EXPECT_FALSE(summary.contains("messages_at_start"));
  EXPECT_THAT(defaults(), Contains("sending rtc summary event. reporterID=77"));
  EXPECT_THAT(texts(), Contains("sending rtc summary event. reporterID=77 a=\"1,2\""));
}

TEST_F(TWReportingSessionRtcWorkerTest, RedundantMessagesAndThoseBeforeTheStartAreNotInTheSummary) {
  send({{"early", 1}});
  startAndRun();
  send({{"a", 1}});
  send({{"a", 1}});
  const ValueMap summary = stopAndTakeSummary();
  EXPECT_EQ(summary.text("a"), "1");
  EXPECT_FALSE(summary.contains("early"));
}

TEST_F(TWReportingSessionRtcWorkerTest, MessagesForOtherWorkersAreInTheSummaryOnly) {
  static const TWReportingSessionWorkerClass kOther{"Other", false, true, false, false, nullptr};
  startAndRun();
  auto addressed = message({{"a", 1}});
  addressed->details.setDestinationWorkers({&kOther});
  session->sendMessage(addressed);
  const ValueMap summary = stopAndTakeSummary();
  EXPECT_THAT(service(0).messages, SizeIs(1));
  EXPECT_EQ(summary.text("a"), "1");
}

TEST_F(TWReportingSessionRtcWorkerTest, AStopWithoutMessagesSendsNoSummaryButFlushesAndEnds) {
  // A session always holds its start and stop messages, so the test calls the reporter directly.
  const auto queue = context->linkReportQueues().makeStrand();
  const auto reporter = std::make_shared<RtcReporter>(queue);
  queue->submit(0, [&] {
    reporter->start({});
    reporter->sendSummary({}, kTelephony, 77);
    reporter->stop();
  });
  run();
  EXPECT_THAT(service(0).messages, IsEmpty());
  EXPECT_EQ(service(0).flushCount, 1U);
  EXPECT_FALSE(service(0).isOpen);
}

TEST_F(TWReportingSessionRtcWorkerTest, AfterTheStopTheServicesSessionIsGone) {
  startAndRun();
  session->stop();
  run();
  EXPECT_EQ(service(0).flushCount, 1U);
  EXPECT_FALSE(service(0).isOpen);
  EXPECT_EQ(texts().back(), "stopping and setting session to nil");
}

TEST_F(TWReportingSessionRtcWorkerTest, ASecondStartMakesASecondSessionOfTheService) {
  startAndRun();
  session->stop();
  session->start();
  send({{"a", 1}});
  run();
  ASSERT_EQ(test.linkReport.count(), 2U);
  EXPECT_THAT(service(1).messages, SizeIs(1));
  EXPECT_EQ(service(1).sessionInfo.text("kLinkReportSessionInfoHierarchyToken"), "root/2");
}

TEST_F(TWReportingSessionRtcWorkerTest, QueuedMessagesAreSentAlsoWhenTheSessionIsGone) {
  session->start();
  send({{"a", 1}});
  session->stop();
  session.reset();
  run();
  EXPECT_THAT(service(0).messages, SizeIs(2));
  EXPECT_FALSE(service(0).isOpen);
}

TEST_F(TWReportingSessionRtcWorkerTest, HeldMessagesAreSentAlsoWhenTheSessionIsGone) {
  test.linkReport.answerLater();
  startAndRun();
  send({{"a", 1}});
  session->stop();
  session.reset();
  run();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_THAT(service(0).messages, SizeIs(2));
  EXPECT_FALSE(service(0).isOpen);
}

TEST_F(TWReportingSessionRtcWorkerTest, AnAnswerAfterTheWorkersEndIsHarmless) {
  test.linkReport.answerLater();
  startAndRun();
  session.reset();
  run();
  EXPECT_FALSE(service(0).isOpen);
  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_THAT(texts(), Not(Contains(HasSubstr("list of backends"))));
}

TEST_F(TWReportingSessionRtcWorkerTest, MessagesThatWaitForBackendsAreBoundedAndTheLossIsLogged) {
  test.linkReport.answerLater();
  startAndRun();
  const std::string large(std::size_t{1} << 20, 'x');
  for (int n = 0; n < 10; ++n) send({{"n", n}, {"large", large + std::to_string(n)}});
  run();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_THAT(service(0).messages, SizeIs(7));
  EXPECT_THAT(errors(), ElementsAre("dropped while waiting for backends, for want of room: 3"));

  test.log.clear();
  send({{"n", 10}});
  session->stop();
  run();
  EXPECT_FALSE(service(0).isOpen);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(TWReportingSessionRtcWorkerTest, WithoutRoomForTheSummaryTheSessionStillEnds) {
  test.linkReport.answerLater();
  startAndRun();
  const std::string large(std::size_t{1} << 20, 'x');
  for (int n = 0; n < 9; ++n) send({{"n", n}, {"large", large + std::to_string(n)}});
  session->stop();
  run();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_FALSE(service(0).isOpen);
  EXPECT_EQ(service(0).flushCount, 1U);
}

// A stop that did not fit left the session of the service open.
TEST_F(TWReportingSessionRtcWorkerTest, AStopIsNotDroppedWhenTheQueueHangs) {
  startAndRun();
  send({{"a", 1}});
  fillQueue();
  session->stop();
  run();
  EXPECT_THAT(service(0).messages, SizeIs(1));  // the summary did not fit
  EXPECT_FALSE(service(0).isOpen);
  EXPECT_EQ(service(0).flushCount, 1U);
}

// Messages of a session whose start did not fit went into the session before it.
TEST_F(TWReportingSessionRtcWorkerTest, NothingOfASessionWhoseStartIsDroppedIsSent) {
  startAndRun();
  fillQueue();
  session->stop();
  session->start();
  send({{"a", 2}});
  run();
  send({{"a", 3}});
  session->stop();
  run();
  ASSERT_EQ(test.linkReport.count(), 1U);
  EXPECT_THAT(service(0).messages, IsEmpty());
  EXPECT_FALSE(service(0).isOpen);

  session->start();
  send({{"a", 4}});
  run();
  ASSERT_EQ(test.linkReport.count(), 2U);
  EXPECT_THAT(service(1).messages, SizeIs(1));
}

TEST_F(TWReportingSessionRtcWorkerTest, AStopIsNotDroppedWhileTheQueueIsHeldAndFull) {
  test.linkReport.answerLater();
  startAndRun();
  const auto held = context->linkReportQueues().makeStrand();
  held->submit(0, [&held] { held->hold(); });
  held->submit(StrandPool::kMaxHeldBytes - 256, [] {});
  session->stop();
  run();
  test.linkReport.answer(0, {{"fleet"}});
  run();
  EXPECT_FALSE(service(0).isOpen);
  EXPECT_EQ(service(0).flushCount, 1U);
}

TEST_F(TWReportingSessionRtcWorkerTest, TheEndOfTheDaemonLogsHowManyMessagesStillWaited) {
  test.linkReport.answerLater();
  startAndRun();
  send({{"a", 1}});
  send({{"a", 2}});
  session.reset();
  context.reset();
  EXPECT_THAT(errors(), ElementsAre("real-time-communication work dropped that waited for backends: 2"));
}

}  // namespace
}  // namespace tonewerk
