// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceAlarmLowRMS.h"

#include <gtest/gtest.h>
#include <thread>

#include "workers/diagnostics/CapsaTest.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class TWReportingCapsaWorkerInstanceAlarmLowRMSTest : public CapsaTest {
 protected:
  void SetUp() override { useSession(makeSessionOf(kServiceAlarms)); }

  void useSession(std::shared_ptr<TWReportingSession> newSession) {
    session = std::move(newSession);
    worker = TWReportingSessionCapsaWorker::initWithSession(session);
    EXPECT_EQ(worker->start(), true);
  }
  // Reports a quiet alarm. No two reports are equal.
  void report(const Value& issue = "LowRMS", AudioEventCategory category = kCategoryError,
              AudioEventType type = kTypeIssueDetector) {
    handle(*worker, {{"issue_type", issue}, {"n", ++reported}}, category, type);
  }
  // Reports often enough and long enough for the instance to fire.
  void reportUntilItFires() {
    report();
    test.clock.advance(16.0);
    report();
    report();
  }
  WorkerInstanceState& state() { return *stateOf(*worker, "TWReportingCapsaWorkerInstanceAlarmLowRMS"); }

  int reported = 0;
  std::shared_ptr<TWReportingSession> session;
  std::shared_ptr<TWReportingSessionCapsaWorker> worker;
};

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, BeginsWithItsThresholds) {
  EXPECT_EQ(state().interestThresholdCount, 3);
  EXPECT_EQ(state().interestThresholdDurationSeconds, 15.0);
  EXPECT_TRUE(state().oncePerSession);
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, IsNotMadeForSingleMessageSessions) {
  session->setSingleMessageSession(true);
  EXPECT_EQ(TWReportingCapsaWorkerInstanceAlarmLowRMS::initWithSession(session), nullptr);
  EXPECT_FALSE(TWReportingCapsaWorkerInstanceAlarmLowRMS::kInstanceClass.handleSingleMessageSession);
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, IsInterestedOnlyInLowRmsIssuesAmongErrors) {
  report();
  EXPECT_EQ(state().interestedCount, 1);
  report("lowrms");
  report(1);
  report("LowRMS", kCategoryGeneric);
  report("LowRMS", 0x20000000 | kCategoryError);
  report("LowRMS", kCategoryError, kTypeError);
  handle(*worker, {{"n", 1}}, kCategoryError, kTypeIssueDetector);
  EXPECT_EQ(state().interestedCount, 1);
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, WatchesAlarmsAndTheTestServiceOnly) {
  for (AudioServiceType service = 0; service <= 14; ++service) {
    useSession(makeSessionOf(service));
    report();
    EXPECT_EQ(state().interestedCount, service == 4 || service == 11 ? 1 : 0) << service;
  }
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest,
       FiresAtTheEarliestOnItsThirdMessageMoreThanFifteenSecondsAfterTheFirst) {
  report();
  report();
  test.clock.advance(15.0);
  report();
  EXPECT_THAT(test.capsa.requests(), IsEmpty());  // three messages, but not more than 15 s
  test.clock.advance(0.5);
  report();
  EXPECT_THAT(test.capsa.requests(), SizeIs(1));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, TwoMessagesDoNotFireHoweverLongItLasts) {
  report();
  test.clock.advance(600.0);
  report();
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
  report();
  EXPECT_THAT(test.capsa.requests(), SizeIs(1));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, NeverFiresASecondTimeInTheSameSession) {
  reportUntilItFires();
  reportUntilItFires();
  reportUntilItFires();
  worker->stop();
  EXPECT_EQ(worker->start(), true);
  reportUntilItFires();
  EXPECT_THAT(test.capsa.requests(), SizeIs(1));
  EXPECT_EQ(state().firedCount, 1);
  useSession(makeSessionOf(kServiceAlarms));
  reportUntilItFires();
  EXPECT_THAT(test.capsa.requests(), SizeIs(2));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, RequestsACaptureOneMinuteLater) {
  reportUntilItFires();
  ASSERT_THAT(test.capsa.requests(), SizeIs(1));
  const MemoryCapsa::Request request = test.capsa.requests().front();
  EXPECT_FALSE(request.isImmediate);
  EXPECT_EQ(request.duration, 60.0);
  EXPECT_EQ(request.events, std::nullopt);
  EXPECT_EQ(request.payload, std::nullopt);
  EXPECT_EQ(request.actions, std::nullopt);
  EXPECT_EQ(request.signature.type, "alarms");
  EXPECT_EQ(request.signature.subType, "Error");
  EXPECT_EQ(request.signature.subtypeContext, "IssueDetector");
  EXPECT_THAT(infos(), ElementsAre("Parameters to Capsa session for alarm Low RMS accepted. Will fire if not "
                                   "cancelled. timeout=60.000000."));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, ParametersThatAreNotAcceptedAreAnErrorLine) {
  test.capsa.refuse();
  reportUntilItFires();
  EXPECT_THAT(errors(), ElementsAre("Capsa session for alarm Low RMS failed to start."));
  EXPECT_THAT(infos(), IsEmpty());
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), IsEmpty());
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, AnAnswerIsKeptAndLogged) {
  reportUntilItFires();
  test.log.clear();
  std::thread([&] { test.capsa.answer(0, MemoryCapsa::started("S1")); }).join();
  test.queues.runAll();
  EXPECT_EQ(state().currentCapsaSessionIdentifier, "S1");
  EXPECT_THAT(infos(),
              ElementsAre("Started Capsa session. sessionId=S1",
                          "Started Capsa session for alarm Low RMS. sessionId=S1 timeout=60.000000 "
                          R"(response={"kFaultsignReplySuccess":true,"kFaultsignReplySessionID":"S1"})"));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, StoppingCancelsThePendingCapture) {
  reportUntilItFires();
  test.capsa.answer(0, MemoryCapsa::started("S1"));
  test.queues.runAll();
  test.log.clear();
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), ElementsAre("S1"));
  EXPECT_THAT(infos(), ElementsAre("Stop called. Cancelling Capsa session for alarm Low RMS. sessionId=S1 "
                                   "timeout=60.000000"));
  EXPECT_THAT(test.log.linesOf("twrb").front().message, HasSubstr("TWReportingSessionCapsaWorker:"));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, StoppingAfterAFailedStartCancelsNoneReturned) {
  reportUntilItFires();
  test.capsa.answer(0, MemoryCapsa::failed(kFaultsignErrorDailyLimitExceeded));
  test.queues.runAll();
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), ElementsAre("NONE_RETURNED"));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, StoppingWithoutAnAnswerCancelsNothing) {
  reportUntilItFires();
  test.log.clear();
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), IsEmpty());
  EXPECT_THAT(test.log.linesOf("twrb"), IsEmpty());
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, StoppingWithoutAFireCancelsNothing) {
  report();
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), IsEmpty());
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, AnAnswerAfterTheStopIsLoggedAndCancelsNothing) {
  reportUntilItFires();
  worker->stop();
  worker.reset();
  session.reset();
  test.log.clear();
  std::thread([&] { test.capsa.answer(0, MemoryCapsa::started("S1")); }).join();
  test.queues.runAll();
  EXPECT_THAT(infos(), Contains(HasSubstr("Started Capsa session for alarm Low RMS. sessionId=S1")));
  EXPECT_THAT(test.capsa.cancelled(), IsEmpty());
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, AStopAfterAnAnswerOnTheWorkQueueFindsTheIdentifier) {
  test.capsa.answerAtOnce(MemoryCapsa::started("S1"));
  context->reportingServerQueue().async([&] {
    reportUntilItFires();
    worker->stop();
  });
  test.queues.runAll();
  EXPECT_THAT(test.capsa.cancelled(), ElementsAre("S1"));
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, InATestSessionTheFireIsSkippedAndNothingIsCancelled) {
  useSession(makeSessionOf(kServiceTest));
  reportUntilItFires();
  EXPECT_THAT(infos(), ElementsAre("Skipping actual fire, as we are running in test mode."));
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
  EXPECT_EQ(state().firedCount, 1);
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), IsEmpty());
}

TEST_F(TWReportingCapsaWorkerInstanceAlarmLowRMSTest, EachSessionCountsSeparately) {
  report();
  test.clock.advance(16.0);
  report();
  useSession(makeSessionOf(kServiceAlarms));
  report();
  EXPECT_EQ(state().interestedCount, 1);
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
