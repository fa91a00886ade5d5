// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/OverloadPacer.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

constexpr Overload kFirst{.time = 10.0, .frames = 1024, .cycle = 7, .xruns = 1};
constexpr Overload kSecond{.time = 10.1, .frames = 512, .cycle = 9, .xruns = 2};
constexpr Overload kThird{.time = 10.2, .frames = 2048, .cycle = 11, .xruns = 4};

TEST(OverloadPacer, LetsTheFirstOnePassAtOnce) {
  OverloadPacer pacer;
  EXPECT_EQ(pacer.take(milliseconds(0)), std::nullopt);
  EXPECT_EQ(pacer.deadline(), std::nullopt);
  pacer.add(kFirst);
  EXPECT_EQ(pacer.take(milliseconds(0)), kFirst);
  EXPECT_EQ(pacer.take(milliseconds(0)), std::nullopt);
}

TEST(OverloadPacer, MergesLaterOverloadsIntoOnePerSecond) {
  OverloadPacer pacer;
  pacer.add(kFirst);
  EXPECT_EQ(pacer.take(milliseconds(500)), kFirst);
  pacer.add(kSecond);
  pacer.add(kThird);
  EXPECT_EQ(pacer.deadline(), milliseconds(1500));
  EXPECT_EQ(pacer.take(milliseconds(1499)), std::nullopt);
  EXPECT_EQ(pacer.take(milliseconds(1500)), (Overload{.time = 10.2, .frames = 512, .cycle = 11, .xruns = 6}));
  EXPECT_EQ(pacer.deadline(), std::nullopt);
}

TEST(OverloadPacer, LetsOneAfterTheIntervalPassAtOnce) {
  OverloadPacer pacer;
  pacer.add(kFirst);
  EXPECT_EQ(pacer.take(milliseconds(0)), kFirst);
  pacer.add(kSecond);
  EXPECT_EQ(pacer.take(milliseconds(1000)), kSecond);
}

TEST(OverloadPacer, GivesAHeldOneBeforeItIsDueOnRequest) {
  OverloadPacer pacer;
  EXPECT_EQ(pacer.takeRest(), std::nullopt);
  pacer.add(kFirst);
  EXPECT_EQ(pacer.take(milliseconds(0)), kFirst);
  pacer.add(kSecond);
  EXPECT_EQ(pacer.takeRest(), kSecond);
  EXPECT_EQ(pacer.takeRest(), std::nullopt);
}

TEST(OverloadPacer, ForgetsAHeldOneWhenCleared) {
  OverloadPacer pacer;
  pacer.add(kFirst);
  pacer.clear();
  EXPECT_EQ(pacer.take(milliseconds(5000)), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
