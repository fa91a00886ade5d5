// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/RetryPolicy.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using std::chrono::duration;
using std::chrono::seconds;
using Verdict = RetryPolicy::Verdict;

double secondsOf(RetryPolicy::Duration time) { return duration<double>(time).count(); }

RetryPolicy withJitter(double jitter) {
  return RetryPolicy([jitter] { return jitter; });
}

TEST(RetryPolicyTest, TriesAgainOnlyAfterTemporaryFailures) {
  for (const int status : {0, 429, 502, 503, 504}) EXPECT_EQ(RetryPolicy::verdictOf(status), Verdict::kRetry);
  for (const int status : {300, 301, 307, 308, 400, 401, 403, 404, 415, 500, 501, 505, 599}) {
    EXPECT_EQ(RetryPolicy::verdictOf(status), Verdict::kDrop) << status;
  }
  for (const int status : {200, 202, 204}) EXPECT_EQ(RetryPolicy::verdictOf(status), Verdict::kDelivered);
  EXPECT_EQ(RetryPolicy::verdictOf(413), Verdict::kSplit);
}

TEST(RetryPolicyTest, WaitsLongerAfterEveryFailureUpToHalfAMinute) {
  RetryPolicy policy = withJitter(1.0);
  for (const double expected : {5.0, 7.5, 11.25, 16.875, 25.3125, 30.0, 30.0}) {
    EXPECT_NEAR(secondsOf(policy.delayAfterFailure(std::nullopt)), expected, 1e-6);
  }
}

TEST(RetryPolicyTest, JitterTakesUpToHalfOfTheWait) {
  EXPECT_NEAR(secondsOf(withJitter(0.0).delayAfterFailure(std::nullopt)), 2.5, 1e-6);
  EXPECT_NEAR(secondsOf(withJitter(0.5).delayAfterFailure(std::nullopt)), 3.75, 1e-6);
}

TEST(RetryPolicyTest, ASuccessResetsTheInterval) {
  RetryPolicy policy = withJitter(1.0);
  policy.delayAfterFailure(std::nullopt);
  policy.delayAfterFailure(std::nullopt);
  policy.succeeded();
  EXPECT_NEAR(secondsOf(policy.delayAfterFailure(std::nullopt)), 5.0, 1e-6);
}

TEST(RetryPolicyTest, WaitsAsLongAsTheEndpointAsksWithinLimits) {
  RetryPolicy policy = withJitter(0.0);
  EXPECT_EQ(policy.delayAfterFailure(seconds(120)), seconds(120));
  EXPECT_EQ(policy.delayAfterFailure(seconds(0)), RetryPolicy::kShortestAsked);
  EXPECT_EQ(policy.delayAfterFailure(seconds(999'999'999)), RetryPolicy::kLongestAsked);
}

TEST(RetryAfterTest, IsSecondsOrADate) {
  constexpr double kNow = 784'111'717.0;  // ten seconds before the date below
  EXPECT_EQ(parseRetryAfter("120", kNow), seconds(120));
  EXPECT_EQ(parseRetryAfter(" 7\r\n", kNow), seconds(7));
  EXPECT_EQ(parseRetryAfter(" Sun, 06 Nov 1994 08:48:47 GMT\r\n", kNow), seconds(10));
  EXPECT_EQ(parseRetryAfter("Sunday, 06-Nov-94 08:48:47 GMT", kNow), seconds(10));
  EXPECT_EQ(parseRetryAfter("Sun Nov  6 08:48:47 1994", kNow), seconds(10));
  EXPECT_EQ(parseRetryAfter("Sun, 06 Nov 1994 08:48:47 GMT", kNow + 100), seconds(0));
}

TEST(RetryAfterTest, RefusesOtherTexts) {
  for (const char* text : {"", " ", "-5", "soon", "1.5", "12 monkeys", "Sun, 06 Nov 1994", "0x10"}) {
    EXPECT_EQ(parseRetryAfter(text, 0.0), std::nullopt) << text;
  }
}

TEST(RetryAfterTest, HugeNumbersAreTheLongestTime) {
  EXPECT_GT(parseRetryAfter("99999999999999999999999999", 0.0), seconds(100'000));
}

}  // namespace
}  // namespace tonewerk
