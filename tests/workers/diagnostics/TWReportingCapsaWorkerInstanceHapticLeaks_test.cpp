// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceHapticLeaks.h"

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

class TWReportingCapsaWorkerInstanceHapticLeaksTest : public CapsaTest {
 protected:
  std::shared_ptr<TWReportingSessionCapsaWorker> makeWorker() {
    return TWReportingSessionCapsaWorker::initWithSession(session);
  }
  // Reports that the hardware has been active for that many seconds in total.
  static void report(TWReportingSessionCapsaWorker& worker, int seconds,
                     AudioEventType type = kTypeEnergybook) {
    handle(worker, {{"Haptic_Active_Hardware_Time_Seconds", seconds}}, kCategoryGeneric, type);
  }
  // Reports often enough and long enough for the instance to fire.
  void reportUntilItFires(TWReportingSessionCapsaWorker& worker) {
    report(worker, ++reported);
    test.clock.advance(61.0);
    report(worker, ++reported);
  }
  static WorkerInstanceState& state(const TWReportingSessionCapsaWorker& worker) {
    return *stateOf(worker, "TWReportingCapsaWorkerInstanceHapticLeaks");
  }

  int reported = 0;
  std::shared_ptr<TWReportingSession> session = makeSessionOf(kServiceGeneric);
};

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, BeginsWithItsThresholds) {
  const WorkerInstanceState& own = state(*makeWorker());
  EXPECT_EQ(own.interestThresholdCount, 2);
  EXPECT_EQ(own.interestThresholdDurationSeconds, 60.0);
  EXPECT_FALSE(own.oncePerSession);
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest,
       IsInterestedInTheActiveTimeInPowerReportsOfAnyCategory) {
  const auto worker = makeWorker();
  handle(*worker, {{"Haptic_Active_Hardware_Time_Seconds", 1}}, 0x40000003, kTypeEnergybook);
  handle(*worker, {{"Haptic_Active_Hardware_Time_Seconds", "later"}}, 0, kTypeEnergybook);
  EXPECT_EQ(state(*worker).interestedCount, 2);
  handle(*worker, {{"haptic_active_hardware_time_seconds", 1}}, 1, kTypeEnergybook);
  report(*worker, 5, kTypeGeneric);
  report(*worker, 6, kTypeUnknown);
  EXPECT_EQ(state(*worker).interestedCount, 2);
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest,
       TwoMessagesWithinAMinuteDoNotFireAndTheNextMoreThanAMinuteAfterTheFirstDoes) {
  const auto worker = makeWorker();
  report(*worker, 1);
  test.clock.advance(30.0);
  report(*worker, 2);
  test.clock.advance(30.0);
  report(*worker, 3);
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
  test.clock.advance(0.5);
  report(*worker, 4);
  EXPECT_THAT(test.capsa.requests(), SizeIs(1));
  EXPECT_EQ(state(*worker).interestedCount, 0);  // counting starts over
  report(*worker, 5);
  test.clock.advance(60.5);
  report(*worker, 6);
  EXPECT_THAT(test.capsa.requests(), SizeIs(2));
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, OneMessageAloneDoesNotFireHoweverLate) {
  const auto worker = makeWorker();
  report(*worker, 1);
  test.clock.advance(3600.0);
  report(*worker, 1);  // a repeat
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, CapturesAtOnceWithTheSessionsProcesses) {
  reportUntilItFires(*makeWorker());
  ASSERT_THAT(test.capsa.requests(), SizeIs(1));
  const MemoryCapsa::Request request = test.capsa.requests().front();
  EXPECT_TRUE(request.isImmediate);
  EXPECT_EQ(request.duration, 0.0);
  EXPECT_EQ(request.events, std::nullopt);
  EXPECT_EQ(request.payload.value_or(ValueMap()).text(),
            R"({"kFaultsignKeyPayloadDEParameters":)"
            R"({"com.orvane.EnergybookCore.DESysLogFilterProcess":{"processIDs":[4711,12]}}})");
  EXPECT_EQ(request.signature.domain, "AudioAnalytics");
  EXPECT_EQ(request.signature.type, "generic");
  EXPECT_EQ(request.signature.subType, "Generic");
  EXPECT_EQ(request.signature.subtypeContext, "Energybook");
  EXPECT_EQ(request.signature.detectedProcess, "player");
  EXPECT_THAT(infos(), ElementsAre("Parameters to Capsa session accepted."));
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, ParametersThatAreNotAcceptedAreAnErrorLine) {
  test.capsa.refuse();
  const auto worker = makeWorker();
  reportUntilItFires(*worker);
  EXPECT_THAT(errors(), ElementsAre("Parameters to Capsa session not accepted!"));
  EXPECT_THAT(infos(), IsEmpty());
  EXPECT_EQ(state(*worker).currentCapsaSessionIdentifier, std::nullopt);
  EXPECT_EQ(state(*worker).firedCount, 1);
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, AnAnswerIsKeptAndLoggedOnTheWorkQueue) {
  const auto worker = makeWorker();
  reportUntilItFires(*worker);
  test.log.clear();
  std::thread([&] { test.capsa.answer(0, MemoryCapsa::started("S1")); }).join();
  EXPECT_EQ(state(*worker).currentCapsaSessionIdentifier, std::nullopt);
  test.queues.runAll();
  EXPECT_EQ(state(*worker).currentCapsaSessionIdentifier, "S1");
  EXPECT_THAT(infos(),
              ElementsAre("Started Capsa session. sessionId=S1",
                          "Started Capsa session for haptics leaks. sessionId=S1 "
                          R"(response={"kFaultsignReplySuccess":true,"kFaultsignReplySessionID":"S1"})"));
  for (const auto& line : test.log.linesOf("twrb")) {
    EXPECT_THAT(line.message, HasSubstr("TWReportingSessionCapsaWorker:"));
  }
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, AnAnswerOnTheWorkQueueIsKeptAtOnce) {
  test.capsa.answerAtOnce(MemoryCapsa::started("S1"));
  const auto worker = makeWorker();
  context->reportingServerQueue().async([&] {
    reportUntilItFires(*worker);
    EXPECT_EQ(state(*worker).currentCapsaSessionIdentifier, "S1");
  });
  test.queues.runAll();
  EXPECT_THAT(infos(), Contains("Parameters to Capsa session accepted."));
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, AnEmptyAnswerLeavesNoneReturned) {
  const auto worker = makeWorker();
  reportUntilItFires(*worker);
  test.log.clear();
  test.capsa.answer(0, std::nullopt);
  test.queues.runAll();
  EXPECT_EQ(state(*worker).currentCapsaSessionIdentifier, "NONE_RETURNED");
  EXPECT_THAT(infos(), ElementsAre("Started Capsa session for haptics leaks. sessionId=NONE_RETURNED "
                                   "response=(null)"));
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, StoppingCancelsNothing) {
  const auto worker = makeWorker();
  EXPECT_EQ(worker->start(), true);
  reportUntilItFires(*worker);
  test.capsa.answer(0, MemoryCapsa::started("S1"));
  test.queues.runAll();
  worker->stop();
  EXPECT_THAT(test.capsa.cancelled(), IsEmpty());
}

// All sessions share one state.

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, SessionsCountTogether) {
  const auto first = makeWorker();
  const auto second = TWReportingSessionCapsaWorker::initWithSession(makeSessionOf(kServiceGeneric));
  EXPECT_EQ(&state(*first), &state(*second));
  const auto other = makeSessionOf(kServiceGeneric);
  const auto third = TWReportingSessionCapsaWorker::initWithSession(other);
  report(*first, 1);
  test.clock.advance(61.0);
  report(*third, 1);  // the repeat of another session's message
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
  report(*third, 2);
  EXPECT_THAT(test.capsa.requests(), SizeIs(1));
  EXPECT_EQ(state(*first).firedCount, 1);
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, TheStateOutlivesItsSessionsAndIsKeptByClassName) {
  auto worker = makeWorker();
  report(*worker, 1);
  const WorkerInstanceState* before = &state(*worker);
  worker.reset();
  session.reset();
  session = makeSessionOf(kServiceApiUsage);
  const auto later = makeWorker();
  EXPECT_EQ(&state(*later), before);
  EXPECT_EQ(state(*later).interestedCount, 1);
  const auto& states = context->singletons().find<SharedWorkerInstanceStates>()->byClassName;
  ASSERT_THAT(states, SizeIs(1));
  EXPECT_EQ(states.begin()->first, "TWReportingCapsaWorkerInstanceHapticLeaks");
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, ATestSessionSkipsTheFireForAllSessions) {
  session->setServiceType(kServiceTest);
  const auto worker = makeWorker();
  reportUntilItFires(*worker);
  EXPECT_THAT(test.capsa.requests(), IsEmpty());
  EXPECT_THAT(infos(), ElementsAre("Skipping actual fire, as we are running in test mode."));
  EXPECT_EQ(state(*worker).firedCount, 1);
  EXPECT_EQ(state(*worker).interestedCount, 0);
}

// Late answers.

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, AnAnswerAfterTheSessionHasEndedIsLoggedAndKeptForAll) {
  auto worker = makeWorker();
  reportUntilItFires(*worker);
  worker->stop();
  worker.reset();
  session.reset();
  test.log.clear();
  std::thread([&] { test.capsa.answer(0, MemoryCapsa::started("S1")); }).join();
  test.queues.runAll();
  EXPECT_THAT(infos(), Contains(HasSubstr("Started Capsa session for haptics leaks. sessionId=S1")));
  session = makeSessionOf(kServiceGeneric);
  EXPECT_EQ(state(*makeWorker()).currentCapsaSessionIdentifier, "S1");
}

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, AnAnswerAfterTheContextHasEndedDoesNothing) {
  reportUntilItFires(*makeWorker());
  session.reset();
  context.reset();
  test.log.clear();
  std::thread([&] { test.capsa.answer(0, MemoryCapsa::started("S1")); }).join();
  test.queues.runAll();
  EXPECT_THAT(test.log.linesOf("twrb"), IsEmpty());
}

// Runs the worker in a session, which adds entries to messages and does not store repeated ones.

TEST_F(TWReportingCapsaWorkerInstanceHapticLeaksTest, CapturesForAStartedSessionThatGetsMessages) {
  session->start();
  for (const double time : {1.0, 1.0, 2.0}) {
    session->sendMessage(messageAt(test.clock.now(), {{"Haptic_Active_Hardware_Time_Seconds", time}},
                                   kCategoryGeneric, kTypeEnergybook));
    test.clock.advance(40.0);
  }
  EXPECT_THAT(test.capsa.requests(), SizeIs(1));
}

}  // namespace
}  // namespace tonewerk
