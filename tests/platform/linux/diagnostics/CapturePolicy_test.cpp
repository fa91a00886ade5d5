// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/CapturePolicy.h"

#include <gtest/gtest.h>
#include <limits>
#include <string>

#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kToday = 20'412;  // 2025-11-20, the initial date of a manual clock
constexpr double kMidnight = (kToday + 1) * 86'400.0;

FaultsignSignature signatureOf(const std::string& type) {
  return {"AudioAnalytics", type, "Error", "IssueDetector", "player", std::nullopt};
}

class CapturePolicyTest : public testing::Test {
 protected:
  FaultsignError ask(const FaultsignSignature& signature, double duration = 0.0) {
    const FaultsignError error = policy.judge(signature, duration);
    if (error == kFaultsignErrorNone) policy.accept(signature);
    return error;
  }
  FaultsignError ask(int type) { return ask(signatureOf(std::to_string(type))); }
  int acceptedOf(int requests) {
    int accepted = 0;
    for (int n = 0; n < requests; ++n) accepted += ask(n) == kFaultsignErrorNone ? 1 : 0;
    return accepted;
  }

  ManualClock clock;
  CapturePolicy policy{clock, {}};
};

// The daily limit.

TEST_F(CapturePolicyTest, TakesTwentyADayAndRefusesTheNext) {
  EXPECT_EQ(acceptedOf(20), 20);
  EXPECT_EQ(ask(20), kFaultsignErrorDailyLimitExceeded);
  EXPECT_EQ(ask(0), kFaultsignErrorDailyLimitExceeded);  // even if it would be throttled, too
  EXPECT_EQ(policy.count(), (CapturePolicy::Count{kToday, 20}));
}

TEST_F(CapturePolicyTest, ADayBeginsAtMidnightInUtcWhateverTheTimeZone) {
  clock.setUtcOffset(std::chrono::minutes(720));
  clock.setNow(kMidnight - 1.0);
  EXPECT_EQ(acceptedOf(21), 20);
  clock.advance(0.5);
  EXPECT_EQ(ask(21), kFaultsignErrorDailyLimitExceeded);
  clock.advance(0.5);
  EXPECT_EQ(ask(21), kFaultsignErrorNone);
  EXPECT_EQ(policy.count(), (CapturePolicy::Count{kToday + 1, 1}));
}

TEST_F(CapturePolicyTest, ContinuesTheCountOfAnEarlierProcess) {
  CapturePolicy later(clock, {kToday, 19});
  EXPECT_EQ(later.judge(signatureOf("a"), 0.0), kFaultsignErrorNone);
  later.accept(signatureOf("a"));
  EXPECT_EQ(later.judge(signatureOf("b"), 0.0), kFaultsignErrorDailyLimitExceeded);
}

TEST_F(CapturePolicyTest, TheCountOfAnotherDayDoesNotMatter) {
  for (const std::int64_t day :
       {kToday - 1, kToday + 1}) {  // the next day is possible if the clock went back
    CapturePolicy later(clock, {day, 20});
    EXPECT_EQ(later.judge(signatureOf("a"), 0.0), kFaultsignErrorNone);
    EXPECT_EQ(later.count(), (CapturePolicy::Count{kToday, 0}));
  }
}

TEST_F(CapturePolicyTest, DoesNotCountRefusedRequests) {
  ask(1);
  ask(1);
  ask(signatureOf("other"), -1.0);
  EXPECT_EQ(policy.count().accepted, 1);
  EXPECT_EQ(policy.judge(signatureOf("another"), 0.0), kFaultsignErrorNone);  // judged, not accepted
  EXPECT_EQ(policy.count().accepted, 1);
}

// The interval.

TEST_F(CapturePolicyTest, TheIntervalIsAMinute) {
  EXPECT_EQ(CapturePolicy::kMinimumInterval, std::chrono::seconds(60));
}

TEST_F(CapturePolicyTest, TakesTheSameAgainAfterTheIntervalAndNotBefore) {
  EXPECT_EQ(ask(1), kFaultsignErrorNone);
  clock.advance(CapturePolicy::kMinimumInterval - std::chrono::nanoseconds(1));
  EXPECT_EQ(ask(1), kFaultsignErrorRequestThrottled);
  clock.advance(std::chrono::nanoseconds(1));
  EXPECT_EQ(ask(1), kFaultsignErrorNone);
}

TEST_F(CapturePolicyTest, ARefusalDoesNotDelayTheNextCapture) {
  ask(1);
  clock.advance(std::chrono::seconds(40));
  EXPECT_EQ(ask(1), kFaultsignErrorRequestThrottled);
  clock.advance(std::chrono::seconds(20));
  EXPECT_EQ(ask(1), kFaultsignErrorNone);
}

TEST_F(CapturePolicyTest, AJumpOfTheWallClockDoesNotShortenTheInterval) {
  ask(1);
  clock.setNow(clock.now() + 3600.0);
  EXPECT_EQ(ask(1), kFaultsignErrorRequestThrottled);
  clock.setNow(clock.now() - 7200.0);
  EXPECT_EQ(ask(1), kFaultsignErrorRequestThrottled);
}

TEST_F(CapturePolicyTest, EveryPartOfASignatureTellsItFromOthers) {
  const FaultsignSignature first{"a", "b", "c", "d", "e", std::nullopt};
  EXPECT_EQ(ask(first), kFaultsignErrorNone);
  EXPECT_EQ(ask({"x", "b", "c", "d", "e", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "x", "c", "d", "e", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "x", "d", "e", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "c", "x", "e", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "c", "d", "x", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "c", "d", std::nullopt, std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "c", "d", "", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "bc", "d", "", "e", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "cd", "", "e", std::nullopt}), kFaultsignErrorNone);
  EXPECT_EQ(ask({"a", "b", "c", "d", "e", ValueMap{{"level", 1}}}), kFaultsignErrorRequestThrottled);
}

TEST_F(CapturePolicyTest, AWithdrawnCaptureDelaysNothingAndCountsForTheDay) {
  const FaultsignSignature signature = signatureOf("alarms");
  const CapturePolicy::Acceptance acceptance = policy.accept(signature);
  EXPECT_EQ(policy.judge(signature, 0.0), kFaultsignErrorRequestThrottled);
  policy.withdraw(signature, acceptance);
  EXPECT_EQ(ask(signature), kFaultsignErrorNone);
  EXPECT_EQ(policy.count().accepted, 2);
}

TEST_F(CapturePolicyTest, ALateWithdrawalKeepsTheNewerAcceptance) {
  const FaultsignSignature signature = signatureOf("alarms");
  const CapturePolicy::Acceptance older = policy.accept(signature);
  clock.advance(CapturePolicy::kMinimumInterval);
  EXPECT_EQ(ask(signature), kFaultsignErrorNone);
  policy.withdraw(signature, older);
  EXPECT_EQ(ask(signature), kFaultsignErrorRequestThrottled);
}

TEST_F(CapturePolicyTest, AWithdrawalDoesNotChangeOtherSignatures) {
  const CapturePolicy::Acceptance acceptance = policy.accept(signatureOf("alarms"));
  EXPECT_EQ(ask(signatureOf("music")), kFaultsignErrorNone);
  policy.withdraw(signatureOf("alarms"), acceptance);
  policy.withdraw(signatureOf("never accepted"), acceptance);
  EXPECT_EQ(ask(signatureOf("music")), kFaultsignErrorRequestThrottled);
}

// Parameters.

TEST_F(CapturePolicyTest, TakesDurationsFromZeroToADay) {
  EXPECT_EQ(ask(signatureOf("zero"), 0.0), kFaultsignErrorNone);
  EXPECT_EQ(ask(signatureOf("negative zero"), -0.0), kFaultsignErrorNone);
  EXPECT_EQ(ask(signatureOf("a day"), 86'400.0), kFaultsignErrorNone);
}

TEST_F(CapturePolicyTest, RefusesInvalidDurations) {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  for (const double duration : {-0.001, 86'400.001, 1.7976931348623157e308, kInfinity, -kInfinity,
                                std::numeric_limits<double>::quiet_NaN()}) {
    EXPECT_EQ(ask(signatureOf("a"), duration), kFaultsignErrorInvalidParameters) << duration;
  }
}

TEST_F(CapturePolicyTest, RefusesASignatureWithoutDomainTypeOrSubtype) {
  EXPECT_EQ(ask({"", "b", "c", "d", "e", std::nullopt}), kFaultsignErrorInvalidParameters);
  EXPECT_EQ(ask({"a", "", "c", "d", "e", std::nullopt}), kFaultsignErrorInvalidParameters);
  EXPECT_EQ(ask({"a", "b", "", "d", "e", std::nullopt}), kFaultsignErrorInvalidParameters);
  EXPECT_EQ(ask(FaultsignSignature{}), kFaultsignErrorInvalidParameters);
  EXPECT_EQ(ask({"a", "b", "c", "", std::nullopt, std::nullopt}), kFaultsignErrorNone);
}

TEST_F(CapturePolicyTest, InvalidParametersTakePrecedenceOverTheDailyLimit) {
  acceptedOf(20);
  EXPECT_EQ(ask(FaultsignSignature{}), kFaultsignErrorInvalidParameters);
}

}  // namespace
}  // namespace tonewerk
