// SPDX-License-Identifier: Apache-2.0
#include "client/Backoff.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

TEST(BackoffTest, WaitsTwiceAsLongAfterEachAttemptUpToItsBound) {
  for (std::uint32_t seed = 1; seed < 100; ++seed) {
    Backoff backoff(milliseconds(250), milliseconds(30'000), seed);
    for (milliseconds about(250); about < milliseconds(30'000); about *= 2) {
      const milliseconds delay = backoff.next();
      EXPECT_GE(delay, std::max(milliseconds(250), about - about / 4));
      EXPECT_LE(delay, std::min(milliseconds(30'000), about + about / 4));
    }
    for (int at = 0; at < 10; ++at) {
      const milliseconds delay = backoff.next();
      EXPECT_GE(delay, milliseconds(22'500));
      EXPECT_LE(delay, milliseconds(30'000));
    }
  }
}

TEST(BackoffTest, SpreadsClientsThatLostTheSameDaemon) {
  Backoff one(milliseconds(250), milliseconds(30'000), 1);
  Backoff other(milliseconds(250), milliseconds(30'000), 2);
  bool differs = false;
  for (int at = 0; at < 8; ++at) differs = one.next() != other.next() || differs;
  EXPECT_TRUE(differs);
}

TEST(BackoffTest, StartsAgainAfterAGoodConnection) {
  Backoff backoff(milliseconds(250), milliseconds(30'000), 1);
  for (int at = 0; at < 8; ++at) backoff.next();
  backoff.reset();
  EXPECT_LE(backoff.next(), milliseconds(313));
}

}  // namespace
}  // namespace tonewerk
