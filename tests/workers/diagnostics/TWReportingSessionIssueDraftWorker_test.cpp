// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/TWReportingSessionIssueDraftWorker.h"

#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr std::string_view kDomain = "com.orvane.tonewerk.twreporting";
constexpr std::string_view kLastRun = "VidroInvalidXyIDRlastRun";
constexpr double kNow = 1'000'000.0;

class TWReportingSessionIssueDraftWorkerTest : public ReportingTest {
 protected:
  TWReportingSessionIssueDraftWorkerTest()
      : ReportingTest({&TWReportingSessionIssueDraftWorker::kWorkerClass}) {
    test.clock.setNow(kNow);
  }

  void enable(const Value& backOff = 3600) {
    makeInternalBuild();
    test.preferences.configure(kDomain, "VidroInvalidXyBackOffSeconds", backOff);
  }
  std::shared_ptr<TWReportingSessionIssueDraftWorker> makeWorker() {
    return TWReportingSessionIssueDraftWorker::initWithSession(session);
  }
  // Makes a worker whose wait after the first message is over.
  std::shared_ptr<TWReportingSessionIssueDraftWorker> makeWatchingWorker() {
    auto worker = makeWorker();
    worker->handleMessage(*messageAt(1.0, {}));
    return worker;
  }
  static std::shared_ptr<TWReportingSessionMessage> errorAt(double time) {
    return messageAt(time, {{"vdac_invalid_x", 1.5}});
  }
  std::size_t drafts() const { return test.issueDrafts.requests().size(); }
  std::optional<Value> lastRun() const { return test.preferences.read(kDomain, kLastRun); }

  std::shared_ptr<TWReportingSession> session = makeSession();
};

TEST_F(TWReportingSessionIssueDraftWorkerTest, IsAConsumerAlsoInSingleMessageSessions) {
  const auto& workerClass = TWReportingSessionIssueDraftWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_TRUE(workerClass.handleSingleMessageSession);
  enable();
  EXPECT_FALSE(makeWorker()->handleRedundantMessages());
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, WithoutABackOffPeriodNoWorkerExists) {
  makeInternalBuild();
  test.log.clear();
  EXPECT_EQ(makeWorker(), nullptr);
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug),
              ElementsAre("VidroInvalidXyBackOffSeconds default not set. Skipping worker. reporterID=77"));
  EXPECT_THAT(test.log.linesOf("twrr")[0].message, StartsWith("TWReportingSessionIssueDraftWorker:"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, OffInternalBuildsNoWorkerExists) {
  test.preferences.configure(kDomain, "VidroInvalidXyBackOffSeconds", 3600);
  test.log.clear();
  EXPECT_EQ(makeWorker(), nullptr);
  EXPECT_THAT(test.log.lines(), IsEmpty());
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, TheFirstMessageNeverTriggersEvenIfItIsTheError) {
  enable();
  const auto worker = makeWorker();
  EXPECT_FALSE(worker->handleMessage(*errorAt(kNow)));
  EXPECT_EQ(drafts(), 0U);
  EXPECT_EQ(lastRun(), std::nullopt);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, AnErrorWithinFiveSecondsOfTheFirstMessageDoesNotTrigger) {
  enable();
  const auto worker = makeWorker();
  worker->handleMessage(*messageAt(100.0, {}));
  worker->handleMessage(*errorAt(103.0));
  worker->handleMessage(*errorAt(105.0));  // exactly at the end of the five seconds
  EXPECT_EQ(drafts(), 0U);
  EXPECT_EQ(lastRun(), std::nullopt);
  worker->handleMessage(*errorAt(105.25));
  EXPECT_EQ(drafts(), 1U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, AfterAMessageBefore1970TheNextOneBeginsTheWait) {
  enable();
  const auto worker = makeWorker();
  worker->handleMessage(*messageAt(-100.0, {}));
  worker->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 0U);
  worker->handleMessage(*errorAt(kNow + 6));
  EXPECT_EQ(drafts(), 1U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ATimeThatIsNoNumberNeverTriggers) {
  enable();
  const double nan = std::numeric_limits<double>::quiet_NaN();
  makeWatchingWorker()->handleMessage(*errorAt(nan));
  const auto worker = makeWorker();
  worker->handleMessage(*messageAt(nan, {}));
  worker->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 0U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, OtherMessagesNeitherTriggerNorClaimThePeriod) {
  enable();
  const auto worker = makeWatchingWorker();
  worker->handleMessage(*messageAt(kNow, {{"vdac_valid_x", 1}, {"x_vdac_invalid_", 1}}));
  EXPECT_EQ(drafts(), 0U);
  EXPECT_EQ(lastRun(), std::nullopt);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, TheDraftDescribesTheError) {
  enable();
  session->setClientProcessName("callapp");
  const auto worker = makeWatchingWorker();
  test.log.clear();
  EXPECT_FALSE(worker->handleMessage(*errorAt(kNow)));
  const auto requests = test.issueDrafts.requests();
  ASSERT_THAT(requests, SizeIs(1));
  EXPECT_EQ(requests[0].processName, "callapp");
  EXPECT_EQ(requests[0].displayReason, "a Vidro spatial positioning error occurred");
  const TrackletDraft& draft = requests[0].draft;
  EXPECT_EQ(draft.title, "Invalid x/y coordinates during a Vidro call (IDR)");
  EXPECT_EQ(
      draft.problemDescription,
      "Invalid coordinates were provided to the audio layer during a Vidro call, making it impossible to "
      "render spatial audio correctly. Filing this tracklet will help determine what went wrong.");
  EXPECT_EQ(draft.component.name, "Vidro Core - Ringwork");
  EXPECT_EQ(draft.component.version, "All");
  EXPECT_EQ(draft.component.identifier, 0);
  EXPECT_EQ(draft.reproducibility, 6);
  EXPECT_EQ(draft.classification, 7);
  EXPECT_THAT(draft.diagnosticExtensionIDs, ElementsAre("com.orvane.DiagnosticExtensions.audio"));
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDefault),
              ElementsAre("Starting issue draft for VidroXYerrorMessage reporterID=77"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, TheComponentsIdentifierComesFromTheConfiguration) {
  enable();
  test.preferences.configure(kDomain, "VidroComponentIdentifier", 4711);
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(test.issueDrafts.requests().at(0).draft.component.identifier, 4711);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, AfterTheSessionsEndTheDraftNamesNoProcess) {
  enable();
  session->setClientProcessName("callapp");
  const auto worker = makeWatchingWorker();
  session.reset();
  worker->handleMessage(*errorAt(kNow));
  EXPECT_EQ(test.issueDrafts.requests().at(0).processName, std::nullopt);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ASuccessIsLogged) {
  enable();
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  test.log.clear();
  ASSERT_TRUE(test.issueDrafts.answerNext());
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kInfo), ElementsAre("Successfully created draft"));
  EXPECT_THAT(test.log.lines().at(0).message, StartsWith("TWReportingSessionIssueDraftWorker:"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ARefusalIsAnErrorLineWithItsReason) {
  enable();
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  ASSERT_TRUE(test.issueDrafts.answerNext("no room left"));
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), ElementsAre("Error creating draft - no room left"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, AnAnswerAfterTheDaemonsEndIsStillLogged) {
  enable();
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  session.reset();
  context.reset();
  test.log.clear();
  ASSERT_TRUE(test.issueDrafts.answerNext("too late"));
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), ElementsAre("Error creating draft - too late"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, WithoutAnAnswerSessionsContinueAndEnd) {
  enable();
  session->start();
  session->sendMessage(messageAt(kNow, {{"a", 1}}));
  session->sendMessage(errorAt(kNow + 10));
  session->stop();
  session.reset();
  EXPECT_EQ(test.issueDrafts.unanswered(), 1U);
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError), IsEmpty());
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, TwoSessionsAnHourApartDraftOnceEachTwoWithinTheHourOnce) {
  enable(3600);
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 1U);
  test.clock.setNow(kNow + 3599.0);
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 1U);
  test.clock.setNow(kNow + 3600.0);
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 2U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, AskingUsesThePeriodAlsoWithoutADraft) {
  enable();
  const auto worker = makeWatchingWorker();
  EXPECT_TRUE(worker->interestedInMessage(*errorAt(kNow)));
  EXPECT_EQ(lastRun(), Value(kNow));
  EXPECT_FALSE(worker->interestedInMessage(*errorAt(kNow)));
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 0U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, TheCheckLogsItsResultAndStoresTheTime) {
  enable();
  const auto worker = makeWorker();
  test.log.clear();
  EXPECT_FALSE(worker->hasRunInTimeframe(60, "some_key"));
  test.clock.setNow(kNow + 59.5);
  EXPECT_TRUE(worker->hasRunInTimeframe(60, "some_key"));
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug),
              ElementsAre("Issue draft has not run. key=some_key backoffSeconds=60.000000",
                          "Issue draft has run. key=some_key lastRun=1000000"));
  EXPECT_EQ(test.preferences.read(kDomain, "some_key"), Value(kNow));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, TheCheckKeepsTheOtherKeysOfTheDomain) {
  enable();
  ASSERT_FALSE(test.preferences.write(kDomain, "other", "kept"));
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(test.preferences.read(kDomain, "other"), Value("kept"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ATimeThatCannotBeStoredIsLoggedAndTheDraftIsMade) {
  enable();
  test.preferences.failWrites(std::errc::no_space_on_device);
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 1U);
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kError),
              ElementsAre("cannot keep VidroInvalidXyIDRlastRun: No space left on device"));
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ALastRunInTheFutureBlocksUntilTheClockHasCaughtUp) {
  enable(60);
  ASSERT_FALSE(test.preferences.write(kDomain, kLastRun, kNow + 1000));
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 0U);
  test.clock.setNow(kNow + 1060);
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 1U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ASecondErrorAfterTheBackOffInTheSameSessionIsOnlyLogged) {
  enable(60);
  const auto worker = makeWatchingWorker();
  worker->handleMessage(*errorAt(kNow));
  test.clock.setNow(kNow + 61);
  test.log.clear();
  EXPECT_FALSE(worker->handleMessage(*errorAt(kNow + 61)));
  EXPECT_EQ(drafts(), 1U);
  EXPECT_THAT(test.log.textsOf("twrr"),
              ElementsAre(StartsWith("Issue draft has not run."),
                          "Issue draft has already run for VidroXYerrorMessage reporterID=77"));
  EXPECT_EQ(lastRun(), Value(kNow + 61));  // the check has stored the time nevertheless
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, AStoppedSessionMayDraftAgainAfterTheBackOff) {
  enable(60);
  const auto worker = makeWatchingWorker();
  worker->handleMessage(*errorAt(kNow));
  test.log.clear();
  worker->stop();
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug),
              ElementsAre("Resetting hasRun to false. reporterID=77"));
  test.clock.setNow(kNow + 61);
  worker->handleMessage(*errorAt(kNow + 61));
  EXPECT_EQ(drafts(), 2U);
}

TEST_F(TWReportingSessionIssueDraftWorkerTest, ABackOffThatIsNoNumberIsNoBackOff) {
  enable("soon");
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  makeWatchingWorker()->handleMessage(*errorAt(kNow));
  EXPECT_EQ(drafts(), 2U);
}

}  // namespace
}  // namespace tonewerk
