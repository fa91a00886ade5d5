// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/CaptureSessions.h"

#include <atomic>
#include <gmock/gmock.h>
#include <thread>

#include "platform/linux/threads/SystemClock.h"
#include "platform/linux/threads/TimerThread.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualTimers.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

CaptureRequest requestOf(const std::string& type, double duration) {
  return {{"AudioAnalytics", type, "Error", "IssueDetector", "player", std::nullopt}, duration, {}};
}

class CaptureSessionsTest : public testing::Test {
 protected:
  struct Made {
    std::string identifier;
    CaptureRequest request;
  };

  // Each request has a different signature.
  CaptureSessions::Outcome start(double duration) {
    return sessions->start(requestOf(std::to_string(++requested), duration));
  }
  CaptureSessions::Outcome snapshot() {
    return sessions->snapshot(requestOf(std::to_string(++requested), 0.0));
  }
  std::vector<std::string> madeIdentifiers() const {
    std::vector<std::string> identifiers;
    for (const Made& capture : made) identifiers.push_back(capture.identifier);
    return identifiers;
  }

  int requested = 0;
  bool hasRoom = true;
  std::vector<Made> made;
  ManualClock clock;
  ManualTimers timers{clock};
  std::shared_ptr<CaptureSessions> sessions = std::make_shared<CaptureSessions>(
      clock, timers, CapturePolicy::Count{}, [this](const std::string& identifier, const CaptureRequest& r) {
        if (hasRoom) made.push_back({identifier, r});
        return hasRoom;
      });
};

TEST_F(CaptureSessionsTest, AnImmediateCaptureIsMadeAtOnce) {
  const CaptureSessions::Outcome outcome = sessions->snapshot(requestOf("alarms", 2.5));
  EXPECT_EQ(outcome.error, kFaultsignErrorNone);
  EXPECT_THAT(outcome.identifier, SizeIs(26));
  EXPECT_THAT(madeIdentifiers(), ElementsAre(outcome.identifier));
  EXPECT_EQ(made.front().request.signature.type, "alarms");
  EXPECT_EQ(made.front().request.duration, 2.5);
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(CaptureSessionsTest, ACaptureWithADurationIsMadeOnceAfterIt) {
  const CaptureSessions::Outcome outcome = start(60.0);
  EXPECT_EQ(outcome.error, kFaultsignErrorNone);
  clock.advance(std::chrono::milliseconds(59'999));
  EXPECT_THAT(made, IsEmpty());
  clock.advance(std::chrono::milliseconds(1));
  EXPECT_THAT(madeIdentifiers(), ElementsAre(outcome.identifier));
  clock.advance(600.0);
  EXPECT_THAT(made, SizeIs(1));
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(CaptureSessionsTest, ADurationIsRoundedUpToWholeMilliseconds) {
  start(0.0);
  start(0.0012);
  clock.advance(std::chrono::milliseconds(1));
  EXPECT_THAT(made, SizeIs(1));
  clock.advance(std::chrono::milliseconds(1));
  EXPECT_THAT(made, SizeIs(2));
}

TEST_F(CaptureSessionsTest, ACancelledCaptureIsNeverMade) {
  const CaptureSessions::Outcome kept = start(60.0);
  const CaptureSessions::Outcome cancelled = start(60.0);
  clock.advance(59.0);
  EXPECT_TRUE(sessions->cancel(cancelled.identifier));
  EXPECT_FALSE(sessions->cancel(cancelled.identifier));
  clock.advance(600.0);
  EXPECT_THAT(madeIdentifiers(), ElementsAre(kept.identifier));
}

TEST_F(CaptureSessionsTest, OnlyPendingCapturesCanBeCancelled) {
  EXPECT_FALSE(sessions->cancel("NONE_RETURNED"));
  EXPECT_FALSE(sessions->cancel(""));
  EXPECT_FALSE(sessions->cancel(snapshot().identifier));
  const std::string due = start(1.0).identifier;
  clock.advance(1.0);
  EXPECT_FALSE(sessions->cancel(due));
  EXPECT_THAT(made, SizeIs(2));
}

// Regression: a limit of 16 was below the daily limit of 20.
TEST_F(CaptureSessionsTest, ADaysCapturesMayAllBePending) {
  for (int n = 0; n < CapturePolicy::kMaxPerDay; ++n) EXPECT_EQ(start(60.0).error, kFaultsignErrorNone) << n;
  EXPECT_EQ(start(60.0).error, kFaultsignErrorDailyLimitExceeded);
  clock.advance(60.0);
  EXPECT_THAT(made, SizeIs(20));
}

TEST_F(CaptureSessionsTest, TheNumberOfPendingCapturesIsLimited) {
  std::string first;
  for (std::size_t n = 0; n < CaptureSessions::kMaxPending; ++n) {
    // The wall clock jumps to another day.
    if (n > 0 && n % CapturePolicy::kMaxPerDay == 0) clock.setNow(clock.now() + 86'400.0);
    const CaptureSessions::Outcome outcome = start(60.0);
    EXPECT_EQ(outcome.error, kFaultsignErrorNone);
    if (n == 0) first = outcome.identifier;
  }
  clock.setNow(clock.now() + 86'400.0);
  EXPECT_EQ(start(60.0).error, kFaultsignErrorServiceUnavailable);
  EXPECT_EQ(snapshot().error, kFaultsignErrorNone);
  EXPECT_EQ(sessions->count().accepted, 1);  // a capture without a place is not counted
  EXPECT_TRUE(sessions->cancel(first));
  EXPECT_EQ(start(60.0).error, kFaultsignErrorNone);
}

TEST_F(CaptureSessionsTest, ARefusedCaptureIsNeitherMadeNorPending) {
  EXPECT_EQ(sessions->snapshot(requestOf("", 0.0)).error, kFaultsignErrorInvalidParameters);
  EXPECT_EQ(sessions->start(requestOf("a", -1.0)).error, kFaultsignErrorInvalidParameters);
  EXPECT_EQ(sessions->start(requestOf("a", 60.0)).error, kFaultsignErrorNone);
  const CaptureSessions::Outcome again = sessions->snapshot(requestOf("a", 0.0));
  EXPECT_EQ(again.error, kFaultsignErrorRequestThrottled);
  EXPECT_EQ(again.identifier, "");
  EXPECT_EQ(timers.count(), 1U);
  EXPECT_THAT(made, IsEmpty());
}

TEST_F(CaptureSessionsTest, ACancelledCaptureCountsForTheDayAndNotForTheInterval) {
  const CaptureSessions::Outcome outcome = sessions->start(requestOf("a", 60.0));
  EXPECT_TRUE(sessions->cancel(outcome.identifier));
  EXPECT_EQ(sessions->count().accepted, 1);
  EXPECT_EQ(sessions->start(requestOf("a", 60.0)).error, kFaultsignErrorNone);
  EXPECT_EQ(sessions->count().accepted, 2);
}

TEST_F(CaptureSessionsTest, CancellingAMadeCaptureDoesNotShortenTheInterval) {
  const std::string due = sessions->start(requestOf("a", 1.0)).identifier;
  clock.advance(1.0);
  EXPECT_FALSE(sessions->cancel(due));
  EXPECT_EQ(sessions->start(requestOf("a", 1.0)).error, kFaultsignErrorRequestThrottled);
}

TEST_F(CaptureSessionsTest, ACaptureWithoutRoomDoesNotCount) {
  hasRoom = false;
  EXPECT_EQ(sessions->snapshot(requestOf("a", 0.0)).error, kFaultsignErrorServiceUnavailable);
  EXPECT_EQ(sessions->count().accepted, 0);
  hasRoom = true;
  EXPECT_EQ(sessions->snapshot(requestOf("a", 0.0)).error, kFaultsignErrorNone);
}

TEST_F(CaptureSessionsTest, APendingCaptureWithoutRoomIsDropped) {
  const std::string identifier = start(1.0).identifier;
  hasRoom = false;
  clock.advance(1.0);
  EXPECT_FALSE(sessions->cancel(identifier));
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(CaptureSessionsTest, FinishDropsPendingCapturesAndAcceptsNoMore) {
  const std::string first = start(60.0).identifier;
  const std::string second = start(30.0).identifier;
  EXPECT_THAT(sessions->finish(), ElementsAre(first, second));
  EXPECT_THAT(sessions->finish(), IsEmpty());
  clock.advance(600.0);
  EXPECT_THAT(made, IsEmpty());
  EXPECT_EQ(snapshot().error, kFaultsignErrorServiceUnavailable);
  EXPECT_EQ(start(1.0).error, kFaultsignErrorServiceUnavailable);
  EXPECT_FALSE(sessions->cancel(first));
  EXPECT_EQ(sessions->count().accepted, 2);
}

TEST_F(CaptureSessionsTest, ATickAfterTheSessionsAreGoneDoesNothing) {
  start(60.0);
  sessions.reset();
  clock.advance(600.0);
  EXPECT_THAT(made, IsEmpty());
}

// With several threads, each capture is either cancelled or made, never both, and none is made after
// finish().
TEST(CaptureSessionsThreadsTest, ACaptureIsEitherCancelledOrMade) {
  const SystemClock clock;
  TimerThread timers;
  for (int round = 0; round < 10; ++round) {
    std::atomic<int> madeCount = 0;
    std::atomic<bool> isFinished = false;
    std::atomic<int> madeAfterTheEnd = 0;
    const auto sessions = std::make_shared<CaptureSessions>(clock, timers, CapturePolicy::Count{},
                                                            [&](const std::string&, const CaptureRequest&) {
                                                              ++madeCount;
                                                              if (isFinished) ++madeAfterTheEnd;
                                                              return true;
                                                            });
    std::atomic<int> cancelledCount = 0;
    const auto startAndCancel = [&](const std::string& name) {
      for (int n = 0; n < 8; ++n) {
        const auto outcome = sessions->start(requestOf(name + std::to_string(n), 0.001));
        if (n % 2 == 0 && sessions->cancel(outcome.identifier)) ++cancelledCount;
      }
    };
    std::thread one([&] { startAndCancel("one"); });
    std::thread other([&] { startAndCancel("other"); });
    one.join();
    other.join();
    const int dropped = static_cast<int>(sessions->finish().size());
    isFinished = true;
    EXPECT_EQ(madeCount + cancelledCount + dropped, 16);
    EXPECT_EQ(madeAfterTheEnd, 0);
  }
}

}  // namespace
}  // namespace tonewerk
