// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionCapsaWorker.h"

#include <gtest/gtest.h>
#include <utility>

#include "workers/diagnostics/CapsaTest.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

// Says what the scripted instance does, and records its calls.
struct Script {
  bool isInterested = true;
  bool canFire = true;
  WorkerInstanceState state;
  std::vector<std::string> calls;
};
Script* script = nullptr;

class ScriptedInstance final : public TWReportingSessionCapsaWorkerInstance {
 public:
  static const TWReportingSessionCapsaWorkerInstanceClass kInstanceClass;
  const TWReportingSessionCapsaWorkerInstanceClass& instanceClass() const override { return kInstanceClass; }
  static std::unique_ptr<TWReportingSessionCapsaWorkerInstance> initWithSession(
      const std::shared_ptr<TWReportingSession>& /*session*/) {
    return std::make_unique<ScriptedInstance>();
  }
  WorkerInstanceState& workerState() override { return script->state; }
  bool interestedInMessage(const TWReportingSessionMessage& /*message*/) override {
    return script->isInterested;
  }
  void handleMessage(const TWReportingSessionMessage& message) override {
    script->calls.push_back("handled n=" + message.message.text("n"));
  }
  bool canFire() const override { return script->canFire; }
  void fire(const TWReportingSessionMessage& message) override {
    script->calls.push_back("fired n=" + message.message.text("n"));
  }
  void start() override { script->calls.emplace_back("started"); }
  void stop() override { script->calls.emplace_back("stopped"); }
};
const TWReportingSessionCapsaWorkerInstanceClass ScriptedInstance::kInstanceClass{"ScriptedInstance", false,
                                                                                  &initWithSession};

constexpr TWReportingSessionCapsaWorkerInstanceClass kNeverMade{
    "NeverMade", true,
    [](const std::shared_ptr<TWReportingSession>&) -> std::unique_ptr<TWReportingSessionCapsaWorkerInstance> {
      return nullptr;
    }};

// Has a worker with one scripted instance.
class TWReportingSessionCapsaWorkerTest : public CapsaTest {
 protected:
  TWReportingSessionCapsaWorkerTest() {
    script = &script_;
    worker.session = session;
    worker.addInstance(ScriptedInstance::kInstanceClass);
  }
  ~TWReportingSessionCapsaWorkerTest() override { script = nullptr; }

  void handle(int n) { CapsaTest::handle(worker, {{"n", n}}, kCategoryError, kTypeIssueDetector); }
  std::vector<std::string> calls() { return std::exchange(script_.calls, {}); }
  WorkerInstanceState& state() { return script_.state; }
  void fireAfter(std::int64_t count, double seconds) {
    state().interestThresholdCount = count;
    state().interestThresholdDurationSeconds = seconds;
  }

  Script script_;
  std::shared_ptr<TWReportingSession> session = makeSessionOf(kServiceAlarms);
  TWReportingSessionCapsaWorker worker;
};

// The workers and instances that a session gets.

TEST_F(TWReportingSessionCapsaWorkerTest, IsAConsumerOfRedundantMessagesTooAlsoInSingleMessageSessions) {
  const auto& workerClass = TWReportingSessionCapsaWorker::kWorkerClass;
  EXPECT_EQ(workerClass.name, "TWReportingSessionCapsaWorker");
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_TRUE(workerClass.handleSingleMessageSession);
  EXPECT_TRUE(worker.handleRedundantMessages());
}

TEST_F(TWReportingSessionCapsaWorkerTest, IsMadeOnInternalBuildsOnly) {
  EXPECT_NE(TWReportingSessionCapsaWorker::initWithSession(session), nullptr);
  test.deviceFacts.set("InternalBuild", false);
  useWorkers({});
  EXPECT_EQ(TWReportingSessionCapsaWorker::initWithSession(makeSession()), nullptr);
}

TEST_F(TWReportingSessionCapsaWorkerTest, HasItsInstancesInOrder) {
  const auto made = TWReportingSessionCapsaWorker::initWithSession(session);
  EXPECT_FALSE(made->started);
  EXPECT_EQ(made->session.lock(), session);
  EXPECT_THAT(namesOf(*made), ElementsAre("TWReportingCapsaWorkerInstanceHapticLeaks",
                                          "TWReportingCapsaWorkerInstanceAlarmLowRMS",
                                          "TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, HasTheHapticsInstanceOnlyWhereTheDevicePropertyIsTrue) {
  for (const Value& property : {Value(false), Value("YES"), Value(1)}) {
    test.deviceFacts.set("HapticLeakCapture", property);
    EXPECT_THAT(namesOf(*TWReportingSessionCapsaWorker::initWithSession(session)),
                ElementsAre("TWReportingCapsaWorkerInstanceAlarmLowRMS",
                            "TWReportingCapsaWorkerInstanceVcqDestroyRecordQueue"))
        << property.text();
  }
}

TEST_F(TWReportingSessionCapsaWorkerTest,
       ASingleMessageSessionGetsOnlyTheHapticsInstanceWhenTheDevicePropertyAllowsIt) {
  session->setSingleMessageSession(true);
  EXPECT_THAT(namesOf(*TWReportingSessionCapsaWorker::initWithSession(session)),
              ElementsAre("TWReportingCapsaWorkerInstanceHapticLeaks"));
  test.deviceFacts.set("HapticLeakCapture", false);
  const auto empty = TWReportingSessionCapsaWorker::initWithSession(session);
  ASSERT_NE(empty, nullptr);
  EXPECT_THAT(namesOf(*empty), IsEmpty());
}

TEST_F(TWReportingSessionCapsaWorkerTest, AnInstanceThatDoesNotApplyToTheSessionIsNotAdded) {
  worker.addInstance(kNeverMade);
  EXPECT_THAT(namesOf(worker), ElementsAre("ScriptedInstance"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, TheFirstWorkerMakesTheSharedStates) {
  EXPECT_EQ(context->singletons().find<SharedWorkerInstanceStates>(), nullptr);
  test.deviceFacts.set("HapticLeakCapture", false);
  EXPECT_NE(TWReportingSessionCapsaWorker::initWithSession(session), nullptr);
  const auto* states = context->singletons().find<SharedWorkerInstanceStates>();
  ASSERT_NE(states, nullptr);
  EXPECT_THAT(states->byClassName, IsEmpty());
}

TEST_F(TWReportingSessionCapsaWorkerTest, StartsAndStopsItsInstances) {
  EXPECT_EQ(worker.start(), true);
  EXPECT_TRUE(worker.started);
  EXPECT_THAT(calls(), ElementsAre("started"));
  worker.stop();
  EXPECT_FALSE(worker.started);
  EXPECT_THAT(calls(), ElementsAre("stopped"));
}

// The counting rule for all instances.

TEST_F(TWReportingSessionCapsaWorkerTest, WithItsInitialStateAnInstanceNeverFires) {
  const WorkerInstanceState fresh;
  EXPECT_EQ(fresh.currentCapsaSessionIdentifier, std::nullopt);
  EXPECT_EQ(fresh.interestedCount, 0);
  EXPECT_EQ(fresh.interestThresholdCount, -1);
  EXPECT_EQ(fresh.interestFirstSeen, std::nullopt);
  EXPECT_EQ(fresh.interestThresholdDurationSeconds, 1.7976931348623157e308);
  EXPECT_FALSE(fresh.oncePerSession);
  EXPECT_EQ(fresh.firedCount, 0);
  EXPECT_EQ(fresh.lastMessage, std::nullopt);
  EXPECT_EQ(fresh.symptomReporter, nullptr);
}

TEST_F(TWReportingSessionCapsaWorkerTest, CountsAnInterestingMessageAndPassesItOn) {
  handle(1);
  EXPECT_THAT(calls(), ElementsAre("handled n=1"));
  EXPECT_EQ(state().interestedCount, 1);
  EXPECT_EQ(state().interestFirstSeen, Date{ManualClock::kStart});
  EXPECT_EQ(state().lastMessage, ValueDigest::of({{"n", 1}}));
  test.clock.advance(2.0);
  handle(2);
  EXPECT_EQ(state().interestedCount, 2);
  EXPECT_EQ(state().interestFirstSeen, Date{ManualClock::kStart});
  EXPECT_EQ(state().lastMessage, ValueDigest::of({{"n", 2}}));
}

TEST_F(TWReportingSessionCapsaWorkerTest, LogsAtDebugLevelWhatItIsInterestedIn) {
  handle(1);
  EXPECT_THAT(test.log.textsOf("twrb", LogLevel::kDebug),
              ElementsAre("Interested in message. instance=ScriptedInstance, category=Error "
                          "type=IssueDetector {\"n\":1}"));
  EXPECT_THAT(test.log.linesOf("twrb").front().message, HasSubstr("TWReportingSessionCapsaWorker:"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, AMessageThatIsNotInterestingChangesNothing) {
  handle(1);
  script_.isInterested = false;
  handle(2);
  EXPECT_EQ(state().interestedCount, 1);
  EXPECT_EQ(state().lastMessage, ValueDigest::of({{"n", 1}}));
  EXPECT_THAT(calls(), ElementsAre("handled n=1"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, AMessageWithoutAPayloadIsSkipped) {
  CapsaTest::handle(worker, {}, kCategoryError, kTypeIssueDetector);
  EXPECT_EQ(state().interestedCount, 0);
  EXPECT_THAT(calls(), IsEmpty());
}

TEST_F(TWReportingSessionCapsaWorkerTest, TwoIdenticalInterestingMessagesInARowCountOnce) {
  handle(1);
  handle(1);
  EXPECT_EQ(state().interestedCount, 1);
  EXPECT_THAT(calls(), ElementsAre("handled n=1"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, ARepeatIsRecognisedByItsPayloadWhateverItsType) {
  handle(1);
  CapsaTest::handle(worker, {{"n", 1.0}}, kCategorySetup, kTypeStart);
  EXPECT_EQ(state().interestedCount, 1);
}

TEST_F(TWReportingSessionCapsaWorkerTest, ARepeatOfAMessageBeforeTheLastInterestingOneCounts) {
  handle(1);
  handle(2);
  handle(1);
  EXPECT_EQ(state().interestedCount, 3);
}

// Earlier, repeats of payloads over 64 KiB were all counted, because such a payload was not kept for the
// comparison.
TEST_F(TWReportingSessionCapsaWorkerTest, ARepeatOfALargePayloadCountsOnceLikeAnyOther) {
  const auto sent = [](char last) {
    return ValueMap{{"n", 1}, {"text", std::string(std::size_t{512} << 10, 'x') + last}};
  };
  for (int round = 0; round < 3; ++round) CapsaTest::handle(worker, sent('a'), 1, 1);
  EXPECT_EQ(state().interestedCount, 1);
  for (int round = 0; round < 3; ++round) CapsaTest::handle(worker, sent('b'), 1, 1);
  EXPECT_EQ(state().interestedCount, 2);
  CapsaTest::handle(worker, sent('a'), 1, 1);
  EXPECT_EQ(state().interestedCount, 3);
}

TEST_F(TWReportingSessionCapsaWorkerTest, WithoutThresholdsItNeverFires) {
  for (int n = 0; n < 10; ++n) {
    handle(n);
    test.clock.advance(1e8);
  }
  EXPECT_THAT(calls(), Not(Contains(HasSubstr("fired"))));
  EXPECT_EQ(state().interestedCount, 10);
}

TEST_F(TWReportingSessionCapsaWorkerTest, WithoutACountThresholdTheFirstMessageFiresOnceTheTimeHasPassed) {
  state().interestThresholdDurationSeconds = -1.0;
  handle(1);
  EXPECT_THAT(calls(), ElementsAre("handled n=1", "fired n=1"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, TheCountThresholdIsInclusive) {
  fireAfter(3, -1.0);
  handle(1);
  handle(2);
  EXPECT_EQ(calls().size(), 2U);
  handle(3);
  EXPECT_THAT(calls(), ElementsAre("handled n=3", "fired n=3"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, TheDurationThresholdMustBeExceeded) {
  fireAfter(1, 60.0);
  handle(1);
  test.clock.advance(60.0);
  handle(2);
  EXPECT_THAT(calls(), Not(Contains(HasSubstr("fired"))));
  test.clock.advance(0.001);
  handle(3);
  EXPECT_THAT(calls(), ElementsAre("handled n=3", "fired n=3"));
}

TEST_F(TWReportingSessionCapsaWorkerTest, AClockThatWentBackDelaysTheFiring) {
  fireAfter(1, 60.0);
  handle(1);
  test.clock.setNow(ManualClock::kStart - 3600.0);
  test.clock.advance(61.0);
  handle(2);
  EXPECT_THAT(calls(), Not(Contains(HasSubstr("fired"))));
}

TEST_F(TWReportingSessionCapsaWorkerTest, FiringMakesAReporterAndRestartsTheCount) {
  fireAfter(2, 10.0);
  handle(1);
  test.clock.advance(11.0);
  handle(2);
  EXPECT_EQ(test.capsa.reporterCount(), 1U);
  EXPECT_NE(state().symptomReporter, nullptr);
  EXPECT_EQ(state().firedCount, 1);
  EXPECT_EQ(state().interestedCount, 0);
  EXPECT_EQ(state().interestFirstSeen, std::nullopt);
  EXPECT_EQ(state().lastMessage, std::nullopt);
  calls();
  handle(2);  // is no longer a repeat
  EXPECT_EQ(state().interestedCount, 1);
  test.clock.advance(11.0);
  handle(3);
  EXPECT_THAT(calls(), ElementsAre("handled n=2", "handled n=3", "fired n=3"));
  EXPECT_EQ(state().firedCount, 2);
}

TEST_F(TWReportingSessionCapsaWorkerTest, AnInstanceThatCannotFireContinuesToCount) {
  script_.canFire = false;
  fireAfter(1, -1.0);
  handle(1);
  handle(2);
  EXPECT_EQ(state().interestedCount, 2);
  EXPECT_EQ(state().firedCount, 0);
  EXPECT_EQ(test.capsa.reporterCount(), 0U);
}

TEST_F(TWReportingSessionCapsaWorkerTest, OncePerSessionItFiresOnceAndThenOnlyCounts) {
  fireAfter(1, -1.0);
  state().oncePerSession = true;
  handle(1);
  EXPECT_THAT(calls(), ElementsAre("handled n=1", "fired n=1"));
  handle(2);
  handle(3);
  EXPECT_THAT(calls(), ElementsAre("handled n=2", "handled n=3"));
  EXPECT_EQ(state().firedCount, 1);
  EXPECT_EQ(state().interestedCount, 2);
  EXPECT_NE(state().interestFirstSeen, std::nullopt);
  EXPECT_EQ(test.capsa.reporterCount(), 1U);
}

TEST_F(TWReportingSessionCapsaWorkerTest, InASessionOfTheTestServiceTheFireIsSkippedYetCountedAndReset) {
  session->setServiceType(kServiceTest);
  fireAfter(1, -1.0);
  handle(1);
  EXPECT_THAT(calls(), ElementsAre("handled n=1"));
  EXPECT_THAT(infos(), ElementsAre("Skipping actual fire, as we are running in test mode."));
  EXPECT_EQ(state().firedCount, 1);
  EXPECT_EQ(state().interestedCount, 0);
  EXPECT_EQ(state().interestFirstSeen, std::nullopt);
  EXPECT_EQ(state().lastMessage, std::nullopt);
  EXPECT_EQ(test.capsa.reporterCount(), 1U);
}

TEST_F(TWReportingSessionCapsaWorkerTest, ARepeatForOneInstanceStillCountsForTheOthers) {
  const auto made = TWReportingSessionCapsaWorker::initWithSession(session);
  const ValueMap payload{{"Haptic_Active_Hardware_Time_Seconds", 1}};
  made->addInstance(ScriptedInstance::kInstanceClass);
  state().lastMessage = ValueDigest::of(payload);
  CapsaTest::handle(*made, payload, 1, kTypeEnergybook);
  EXPECT_EQ(state().interestedCount, 0);
  EXPECT_EQ(stateOf(*made, "TWReportingCapsaWorkerInstanceHapticLeaks")->interestedCount, 1);
}

TEST_F(TWReportingSessionCapsaWorkerTest, AMessageAfterTheSessionHasEndedIsIgnored) {
  session.reset();
  handle(1);
  EXPECT_EQ(state().interestedCount, 0);
}

// Answers of the capture service.

class CapsaReplyTest : public CapsaTest {
 protected:
  static std::string decode(const MemoryCapsa::ReplyMap& reply) {
    return TWReportingSessionCapsaWorker::getSessionIdentifierFromResponse(reply);
  }
};

TEST_F(CapsaReplyTest, ASuccessGivesTheSessionIdentifier) {
  EXPECT_EQ(decode(MemoryCapsa::started("S1")), "S1");
  EXPECT_THAT(infos(), ElementsAre("Started Capsa session. sessionId=S1"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(CapsaReplyTest, ASuccessWithoutASessionIdentifierGivesNoneReturned) {
  EXPECT_EQ(decode(ValueMap{{kFaultsignReplySuccess, true}}), "NONE_RETURNED");
  EXPECT_THAT(errors(), ElementsAre("Started Capsa session, but no sessionId found!"));
  EXPECT_THAT(infos(), IsEmpty());
}

TEST_F(CapsaReplyTest, NoReplyIsAFailureForAnUnknownReason) {
  EXPECT_EQ(decode(std::nullopt), "NONE_RETURNED");
  EXPECT_THAT(errors(), ElementsAre("Failed starting capsa session. Unknown reason.",
                                    "Failed starting capsa session. reason=kFaultsignErrorNone"));
}

TEST_F(CapsaReplyTest, AReplyWithoutAReasonIsAFailureForAnUnknownReason) {
  EXPECT_EQ(decode(ValueMap{{kFaultsignReplySuccess, false}, {kFaultsignReplySessionID, "S1"}}),
            "NONE_RETURNED");
  EXPECT_THAT(errors(), ElementsAre("Failed starting capsa session. Unknown reason.",
                                    "Failed starting capsa session. reason=kFaultsignErrorNone"));
}

TEST_F(CapsaReplyTest, AFailureWithoutAnErrorIsAnErrorLine) {
  EXPECT_EQ(decode(MemoryCapsa::failed(kFaultsignErrorNone)), "NONE_RETURNED");
  EXPECT_THAT(errors(), ElementsAre("Failed starting capsa session. reason=kFaultsignErrorNone"));
  EXPECT_THAT(infos(), IsEmpty());
}

TEST_F(CapsaReplyTest, EveryOtherReasonIsNamedAtInfoLevel) {
  const std::vector<std::pair<FaultsignError, std::string>> names{
      {kFaultsignErrorServiceNotReady, "kFaultsignErrorServiceNotReady"},
      {kFaultsignErrorNotSupported, "kFaultsignErrorNotSupported"},
      {kFaultsignErrorServiceUnavailable, "kFaultsignErrorServiceUnavailable"},
      {kFaultsignErrorServiceInterrupted, "kFaultsignErrorServiceInterrupted"},
      {kFaultsignErrorInvalidParameters, "kFaultsignErrorInvalidParameters"},
      {kFaultsignErrorDailyLimitExceeded, "kFaultsignErrorDailyLimitExceeded"},
      {kFaultsignErrorRandomizedSuppression, "kFaultsignErrorRandomizedSuppression"},
      {kFaultsignErrorSessionNotFound, "kFaultsignErrorSessionNotFound"},
      {kFaultsignErrorRequestThrottled, "kFaultsignErrorRequestThrottled"}};
  for (const auto& entry : names) {
    test.log.clear();
    EXPECT_EQ(decode(MemoryCapsa::failed(entry.first)), "NONE_RETURNED");
    EXPECT_THAT(infos(), ElementsAre("Failed starting capsa session. reason=" + entry.second));
    EXPECT_THAT(errors(), IsEmpty());
  }
}

TEST_F(CapsaReplyTest, AReasonOutsideTheTableIsShownAsItsNumber) {
  EXPECT_EQ(decode(ValueMap{{kFaultsignReplySuccess, false}, {kFaultsignReplyReason, -7}}), "NONE_RETURNED");
  EXPECT_EQ(decode(ValueMap{{kFaultsignReplyReason, 10}}), "NONE_RETURNED");
  EXPECT_THAT(infos(), ElementsAre("Failed starting capsa session. reason=-7",
                                   "Failed starting capsa session. reason=10"));
  EXPECT_THAT(errors(), IsEmpty());
}

// Signatures of captures.

TEST_F(CapsaReplyTest, ASignatureNamesTheServiceTheMessagesCategoryAndTypeAndTheProcess) {
  const auto session = makeSessionOf(kServiceAlarms);
  const auto reporter = test.capsa.makeReporter();
  const TWReportingSessionMessage message({{"n", 1}}, 0x20000000 | kCategoryError, kTypeIssueDetector);
  FaultsignSignature signature =
      TWReportingSessionCapsaWorker::signatureFromMessage(message, *session, *reporter);
  EXPECT_EQ(signature.domain, "AudioAnalytics");
  EXPECT_EQ(signature.type, "alarms");
  EXPECT_EQ(signature.subType, "HAL_Error");
  EXPECT_EQ(signature.subtypeContext, "IssueDetector");
  EXPECT_EQ(signature.detectedProcess, "player");
  EXPECT_EQ(signature.triggerThresholdValues, std::nullopt);

  session->setClientProcessName(std::nullopt);
  signature = TWReportingSessionCapsaWorker::signatureFromMessage(message, *session, *reporter);
  EXPECT_EQ(signature.detectedProcess, std::nullopt);
}

}  // namespace
}  // namespace tonewerk
