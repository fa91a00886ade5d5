// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionDPWorker.h"

#include <chrono>
#include <cmath>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "platform/Heartbeat.h"
#include "session/TWReportingDefaults.h"
#include "support/ReportingTest.h"
#include "workers/sinks/TWReportingDPSettings.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr AudioEventCategory kIo = 7;
constexpr AudioEventType kError = 6;
constexpr std::string_view kNotification = "com.orvane.tonewerk.dropped-whirlcap";

class TWReportingSessionDPWorkerTest : public ReportingTest {
 protected:
  TWReportingSessionDPWorkerTest() : ReportingTest({&TWReportingSessionDPWorker::kWorkerClass}) {
    const auto registration = test.notifications.registerHandler(
        kNotification, context->reportingServerQueue(), [this](NotificationService::Token) { ++posts_; });
    EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  }
  ~TWReportingSessionDPWorkerTest() override {
    session.reset();
    context.reset();  // its queue may still run code that counts posts
  }

  void configure(std::string_view key, const Value& value) {
    test.preferences.configure("com.orvane.tonewerk.twreporting", key, value);
  }
  void switchOn() {
    makeInternalBuild();
    configure("enable_whirlcap", true);
  }
  std::shared_ptr<TWReportingSessionDPWorker> makeWorker() {
    return TWReportingSessionDPWorker::initWithSession(session);
  }
  static TWReportingSessionMessage overload(ValueMap payload) { return {std::move(payload), kIo, kError}; }
  static TWReportingSessionMessage overload() { return overload({{"smallest_buffer_frame_size", 512}}); }

  // How often the notification has been posted.
  int posts() {
    test.queues.runAll();
    return posts_;
  }
  std::size_t requests() const { return test.whirlcaps.requests().size(); }
  std::vector<std::string> lines(LogLevel level) const { return test.log.textsOf("twrl", level); }

  std::shared_ptr<TWReportingSession> session = makeSession();

 private:
  int posts_ = 0;
};

TEST_F(TWReportingSessionDPWorkerTest, IsAConsumerOfStartedSessionsOnly) {
  const auto& workerClass = TWReportingSessionDPWorker::kWorkerClass;
  EXPECT_TRUE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_FALSE(workerClass.handleSingleMessageSession);
  switchOn();
  EXPECT_FALSE(makeWorker()->handleRedundantMessages());
}

TEST_F(TWReportingSessionDPWorkerTest, WithoutTheSwitchNoWorkerExists) {
  makeInternalBuild();
  EXPECT_EQ(makeWorker(), nullptr);
  EXPECT_THAT(test.log.textsOf("twrl"), IsEmpty());
}

TEST_F(TWReportingSessionDPWorkerTest, WithTheSwitchOffNoWorkerExists) {
  makeInternalBuild();
  configure("enable_whirlcap", false);
  EXPECT_EQ(makeWorker(), nullptr);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
}

TEST_F(TWReportingSessionDPWorkerTest, OffInternalBuildsNoWorkerExistsAndOnlyTheSwitchIsRead) {
  configure("enable_whirlcap", true);
  configure("io_cycle", 5);
  EXPECT_EQ(makeWorker(), nullptr);
  EXPECT_THAT(lines(LogLevel::kDebug), ElementsAre("Value of enable_whirlcap is 1"));
}

TEST_F(TWReportingSessionDPWorkerTest, WhereItIsSwitchedOnEverySessionHasAWorkerThatStarts) {
  switchOn();
  session->start();
  ASSERT_THAT(session->messageWorkers(), SizeIs(1));
  EXPECT_TRUE(session->messageWorkers()[0]->started);
  EXPECT_EQ(makeWorker()->start(), true);
}

TEST_F(TWReportingSessionDPWorkerTest, TheSwitchMayBeAText) {
  makeInternalBuild();
  configure("enable_whirlcap", "YES");
  EXPECT_NE(makeWorker(), nullptr);
}

TEST_F(TWReportingSessionDPWorkerTest, EveryValueThatIsThereIsLoggedAsItIsRead) {
  switchOn();
  configure("io_buffer_size", 256);
  configure("wait_time", 1.5);
  makeWorker();
  EXPECT_THAT(lines(LogLevel::kDebug),
              ElementsAre("Value of enable_whirlcap is 1", "Value of io_buffer_size is 256",
                          "Value of wait_time is 1.5"));
  EXPECT_THAT(test.log.linesOf("twrl")[0].message, StartsWith("TWReportingSessionDPWorker:"));
}

TEST_F(TWReportingSessionDPWorkerTest, AbsentSettingsReadAsNothing) {
  EXPECT_FALSE(TWReportingSessionDPWorker::getEnableFlag("enable_whirlcap"));
  EXPECT_EQ(TWReportingSessionDPWorker::getRunTimeDefaults("io_cycle"), 0);
  EXPECT_EQ(TWReportingSessionDPWorker::getDoubleRunTimeDefaults("wait_time"), 0.0);
  EXPECT_EQ(TWReportingSessionDPWorker::getUserDefaults().read("io_cycle"), std::nullopt);
  EXPECT_THAT(test.log.textsOf("twrl"), IsEmpty());
}

TEST_F(TWReportingSessionDPWorkerTest, IsInterestedInErrorsOfIoOnly) {
  switchOn();
  const auto worker = makeWorker();
  test.log.clear();
  EXPECT_TRUE(worker->interestedInMessage(overload()));
  EXPECT_THAT(lines(LogLevel::kInfo), ElementsAre("Interested in overload"));
  EXPECT_FALSE(worker->interestedInMessage({{}, kIo, 0}));
  EXPECT_FALSE(worker->interestedInMessage({{}, 4, kError}));
  EXPECT_FALSE(worker->interestedInMessage({{}, 0x00010000 | kIo, kError}));
  EXPECT_THAT(lines(LogLevel::kInfo), SizeIs(1));
}

TEST_F(TWReportingSessionDPWorkerTest, AnOverloadIsRequestedAndAnnounced) {
  switchOn();
  const auto worker = makeWorker();
  const auto message = overload({{"smallest_buffer_frame_size", 512},
                                 {"io_cycle", 7},
                                 {"HostApplicationDisplayID", "com.orvane.game"}});
  test.log.clear();
  EXPECT_FALSE(worker->handleMessage(message));
  const auto requests = test.whirlcaps.requests();
  ASSERT_THAT(requests, SizeIs(1));
  EXPECT_EQ(requests[0].requester, "com.orvane.tonewerk");
  EXPECT_EQ(requests[0].reason, "AudioOverloads");
  EXPECT_EQ(requests[0].description, "com.orvane.game");
  EXPECT_EQ(requests[0].payload, message.message);
  EXPECT_TRUE(requests[0].flags.first);
  EXPECT_TRUE(requests[0].flags.second);
  EXPECT_EQ(posts(), 1);
  EXPECT_THAT(test.log.textsOf("twrl"),
              ElementsAre("Interested in overload", "Dropping whirlcap " + message.description(),
                          "Dropped whirlcap"));
  EXPECT_THAT(lines(LogLevel::kInfo), SizeIs(3));
}

TEST_F(TWReportingSessionDPWorkerTest, TheNotificationIsPostedAfterTheRequest) {
  switchOn();
  const auto worker = makeWorker();
  int postsAtRequest = -1;
  std::vector<std::string> linesAtRequest;
  test.whirlcaps.onRequest([&] {
    postsAtRequest = posts();
    linesAtRequest = lines(LogLevel::kInfo);
  });
  worker->handleMessage(overload());
  EXPECT_EQ(postsAtRequest, 0);
  EXPECT_THAT(linesAtRequest, ElementsAre("Interested in overload", StartsWith("Dropping whirlcap ")));
  EXPECT_EQ(posts(), 1);
}

TEST_F(TWReportingSessionDPWorkerTest, ANotificationThatCannotBePostedIsAnErrorLine) {
  switchOn();
  const auto worker = makeWorker();
  test.notifications.failPosts(std::errc::no_space_on_device);
  worker->handleMessage(overload());
  EXPECT_EQ(requests(), 1U);
  EXPECT_THAT(lines(LogLevel::kError),
              ElementsAre("cannot post com.orvane.tonewerk.dropped-whirlcap: No space left on device"));
  EXPECT_THAT(lines(LogLevel::kInfo), Contains("Dropped whirlcap"));
}

TEST_F(TWReportingSessionDPWorkerTest, WithoutAnApplicationTheDescriptionIsThePlaceholder) {
  switchOn();
  makeWorker()->handleMessage(overload());
  ASSERT_EQ(requests(), 1U);
  EXPECT_EQ(test.whirlcaps.requests()[0].description, "(null)");
}

TEST_F(TWReportingSessionDPWorkerTest, ABufferOf512FramesTriggersOneOf511DoesNot) {
  switchOn();
  const auto worker = makeWorker();
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 511}}));
  EXPECT_EQ(requests(), 0U);
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 512}}));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(TWReportingSessionDPWorkerTest, ABufferSizeOfZeroBehavesAs512) {
  switchOn();
  configure("io_buffer_size", 0);
  const auto worker = makeWorker();
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 511}}));
  EXPECT_EQ(requests(), 0U);
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 512}}));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(TWReportingSessionDPWorkerTest, AConfiguredBufferSizeIsTheSmallestThatTriggers) {
  switchOn();
  configure("io_buffer_size", 64);
  const auto worker = makeWorker();
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 63}}));
  EXPECT_EQ(requests(), 0U);
  worker->handleMessage(overload({{"smallest_buffer_frame_size", "64"}}));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(TWReportingSessionDPWorkerTest, TheBufferSizesLow32BitsCount) {
  switchOn();
  const auto worker = makeWorker();
  worker->handleMessage(overload({{"smallest_buffer_frame_size", std::int64_t{1} << 32}}));
  EXPECT_EQ(requests(), 0U);
}

TEST_F(TWReportingSessionDPWorkerTest, AnOverloadWithoutABufferSizeDoesNotTrigger) {
  switchOn();
  makeWorker()->handleMessage(overload({{"io_cycle", 100}}));
  EXPECT_EQ(requests(), 0U);
}

TEST_F(TWReportingSessionDPWorkerTest, AnIoCycleBelowTheSettingDoesNotTriggerOneThatEqualsItDoes) {
  switchOn();
  configure("io_cycle", 10);
  const auto worker = makeWorker();
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 512}, {"io_cycle", 9}}));
  worker->handleMessage(overload());  // without the key it counts as 0
  EXPECT_EQ(requests(), 0U);
  worker->handleMessage(overload({{"smallest_buffer_frame_size", 512}, {"io_cycle", 10}}));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(TWReportingSessionDPWorkerTest, TwoOverloadsFiveSecondsApartProduceOneRequestTenAndAHalfTwo) {
  switchOn();
  const auto worker = makeWorker();
  worker->handleMessage(overload());
  test.clock.advance(5.0);
  worker->handleMessage(overload());
  EXPECT_EQ(requests(), 1U);
  EXPECT_EQ(posts(), 1);
  test.clock.advance(5.5);
  worker->handleMessage(overload());
  EXPECT_EQ(requests(), 2U);
  EXPECT_EQ(posts(), 2);
}

TEST_F(TWReportingSessionDPWorkerTest, ExactlyTenSecondsLaterIsTooEarly) {
  switchOn();
  const auto worker = makeWorker();
  test.clock.setNow(1000.0);
  worker->handleMessage(overload());
  test.clock.setNow(1010.0);
  worker->handleMessage(overload());
  EXPECT_EQ(requests(), 1U);
  test.clock.setNow(1010.25);
  worker->handleMessage(overload());
  EXPECT_EQ(requests(), 2U);
}

TEST_F(TWReportingSessionDPWorkerTest, TwoSessionsCanEachRequestWithinTheSameTenSeconds) {
  switchOn();
  const auto one = makeWorker();
  const auto other = makeWorker();
  one->handleMessage(overload());
  other->handleMessage(overload());
  EXPECT_EQ(requests(), 2U);
}

TEST_F(TWReportingSessionDPWorkerTest, AMessageOfAnotherKindIsLoggedAsNotMeetingTheConditions) {
  switchOn();
  const auto worker = makeWorker();
  test.log.clear();
  test.clock.setNow(1000.5);
  EXPECT_FALSE(worker->handleMessage({{{"smallest_buffer_frame_size", 512}, {"io_cycle", 3}}, kIo, 1}));
  EXPECT_FALSE(worker->handleMessage({{}, 4, kError}));
  EXPECT_THAT(test.log.textsOf("twrl"),
              ElementsAre("Did not drop whirlcap, right conditions not met: buffer size : 512, "
                          "time diff : 1000.500000, io cycle: 3",
                          "Did not drop whirlcap, right conditions not met: buffer size : 0, "
                          "time diff : 1000.500000, io cycle: 0"));
  EXPECT_THAT(lines(LogLevel::kDebug), SizeIs(2));
  EXPECT_EQ(requests(), 0U);
  EXPECT_EQ(posts(), 0);
}

TEST_F(TWReportingSessionDPWorkerTest, AnOverloadThatComesTooSoonIsLogged) {
  switchOn();
  const auto worker = makeWorker();
  test.clock.setNow(1000.0);
  worker->handleMessage(overload());
  test.clock.setNow(1004.0);
  test.log.clear();
  worker->handleMessage(overload());
  EXPECT_THAT(test.log.textsOf("twrl"),
              ElementsAre("Interested in overload",
                          "Did not drop whirlcap, right conditions not met: buffer size : 512, "
                          "time diff : 4.000000, io cycle: 0"));
}

TEST_F(TWReportingSessionDPWorkerTest, ABufferSizeIsLoggedAsItWasCompared) {
  switchOn();
  const auto worker = makeWorker();
  test.log.clear();
  worker->handleMessage(overload({{"smallest_buffer_frame_size", (std::int64_t{1} << 32) + 100}}));
  worker->handleMessage(overload({{"smallest_buffer_frame_size", (std::uint64_t{1} << 63U) + 5}}));
  EXPECT_THAT(lines(LogLevel::kDebug),
              ElementsAre(HasSubstr("buffer size : 100,"), HasSubstr("buffer size : 5,")));
  EXPECT_EQ(requests(), 0U);
}

TEST_F(TWReportingSessionDPWorkerTest, LaterChangesOfTheMessageDoNotReachTheRequest) {
  switchOn();
  const auto worker = makeWorker();
  auto message = overload({{"smallest_buffer_frame_size", 512}, {"nested", ValueMap{{"a", 1}}}});
  worker->handleMessage(message);
  message.message.set("nested", ValueMap{{"a", 2}});
  message.message.set("more", true);
  EXPECT_EQ(test.whirlcaps.requests().at(0).payload,
            (ValueMap{{"smallest_buffer_frame_size", 512}, {"nested", ValueMap{{"a", 1}}}}));
}

TEST_F(TWReportingSessionDPWorkerTest, TheRequestWaitsForTheWaitTimeInWholeMicroseconds) {
  switchOn();
  configure("wait_time", 2500.9);
  const auto worker = makeWorker();
  const auto before = test.clock.monotonic();
  std::chrono::nanoseconds atRequest{};
  test.whirlcaps.onRequest([&] { atRequest = test.clock.monotonic(); });
  worker->handleMessage(overload());
  EXPECT_EQ(atRequest - before, std::chrono::microseconds(2500));
}

TEST_F(TWReportingSessionDPWorkerTest, TheTenSecondsCountFromBeforeTheWait) {
  switchOn();
  configure("wait_time", 8e6);
  const auto worker = makeWorker();
  worker->handleMessage(overload());
  test.clock.advance(2.5);
  worker->handleMessage(overload());
  EXPECT_EQ(requests(), 2U);
}

TEST_F(TWReportingSessionDPWorkerTest, AnInvalidWaitTimeCountsAsZero) {
  switchOn();
  for (const Value& waitTime :
       {Value(-5.0), Value(std::nan("")), Value(-HUGE_VAL), Value(0.9), Value("soon")}) {
    configure("wait_time", waitTime);
    const auto worker = makeWorker();
    const auto before = test.clock.monotonic();
    worker->handleMessage(overload());
    EXPECT_EQ(test.clock.monotonic(), before) << waitTime.text();
  }
  EXPECT_EQ(requests(), 5U);
}

TEST_F(TWReportingSessionDPWorkerTest, NoWaitIsLongerThanTenSeconds) {
  switchOn();
  for (const double waitTime : {10e6, 10e6 + 1, 1e18, HUGE_VAL}) {
    configure("wait_time", waitTime);
    const auto worker = makeWorker();
    const auto before = test.clock.monotonic();
    worker->handleMessage(overload());
    EXPECT_EQ(test.clock.monotonic() - before, std::chrono::seconds(10)) << waitTime;
  }
}

TEST_F(TWReportingSessionDPWorkerTest, ThereIsNoWaitWhenTheConditionsAreNotMet) {
  switchOn();
  configure("wait_time", 1000);
  const auto worker = makeWorker();
  const auto before = test.clock.monotonic();
  worker->handleMessage(overload({}));
  EXPECT_EQ(test.clock.monotonic(), before);
}

TEST_F(TWReportingSessionDPWorkerTest, EachNewWorkerReadsTheSettingsAgainForAll) {
  switchOn();
  const auto old = makeWorker();
  old->handleMessage(overload({{"smallest_buffer_frame_size", 64}}));
  EXPECT_EQ(requests(), 0U);
  configure("io_buffer_size", 64);
  old->handleMessage(overload({{"smallest_buffer_frame_size", 64}}));
  EXPECT_EQ(requests(), 0U);
  makeWorker();
  old->handleMessage(overload({{"smallest_buffer_frame_size", 64}}));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(TWReportingSessionDPWorkerTest, WithNegativeSettingsEveryOverloadTriggers) {
  switchOn();
  configure("io_buffer_size", -1);
  makeWorker()->handleMessage(overload({}));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(TWReportingSessionDPWorkerTest, ASessionsOverloadReachesTheRequestWithWhatTheSessionAdds) {
  switchOn();
  session->start();
  session->sendMessage(message({{"smallest_buffer_frame_size", 1024}}, kIo, kError));
  ASSERT_EQ(requests(), 1U);
  EXPECT_TRUE(test.whirlcaps.requests()[0].payload.contains("twreporting_timestamp"));
}

// A thread that sleeps for longer than it said would look like one that hangs.
TEST_F(TWReportingSessionDPWorkerTest, TheWaitIsLongWorkOfItsLength) {
  switchOn();
  configure("wait_time", 8e6);
  const auto worker = makeWorker();
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread scope(heartbeat);
  std::chrono::milliseconds allowance{0};
  const auto timer =
      test.timers.repeat(std::chrono::seconds(3), [&] { allowance = heartbeat->read().allowance; });
  worker->handleMessage(overload());
  EXPECT_EQ(allowance, std::chrono::seconds(8));
  EXPECT_EQ(heartbeat->read().allowance, std::chrono::seconds(0));
}

}  // namespace
}  // namespace tonewerk
