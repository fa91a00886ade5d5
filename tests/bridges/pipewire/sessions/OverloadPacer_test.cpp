// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/OverloadPacer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>

#include "values/Value.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

const Overload kFirst{.time = 10.0, .frames = 1024, .cycle = 7, .xruns = 1};
const Overload kSecond{.time = 10.1, .frames = 512, .cycle = 9, .xruns = 2};
const Overload kThird{.time = 10.2, .frames = 2048, .cycle = 11, .xruns = 4};

Overload overloadOf(const std::string& culprit, double overMilliseconds) {
  return {.time = 10.0,
          .frames = 1024,
          .cycle = 7,
          .xruns = 1,
          .verdict = {culprit, overMilliseconds, 20.0, {{"glitch_id", overMilliseconds}}}};
}

TEST(OverloadPacer, LetsTheFirstOnePassAtOnce) {
  OverloadPacer pacer;
  EXPECT_THAT(pacer.take(milliseconds(0)), IsEmpty());
  EXPECT_EQ(pacer.deadline(), std::nullopt);
  pacer.add(kFirst);
  EXPECT_THAT(pacer.take(milliseconds(0)), ElementsAre(kFirst));
  EXPECT_THAT(pacer.take(milliseconds(0)), IsEmpty());
}

TEST(OverloadPacer, MergesLaterOverloadsIntoOnePerSecond) {
  OverloadPacer pacer;
  pacer.add(kFirst);
  EXPECT_THAT(pacer.take(milliseconds(500)), ElementsAre(kFirst));
  pacer.add(kSecond);
  pacer.add(kThird);
  EXPECT_EQ(pacer.deadline(), milliseconds(1500));
  EXPECT_THAT(pacer.take(milliseconds(1499)), IsEmpty());
  EXPECT_THAT(pacer.take(milliseconds(1500)),
              ElementsAre(Overload{.time = 10.2, .frames = 512, .cycle = 11, .xruns = 6}));
  EXPECT_EQ(pacer.deadline(), std::nullopt);
}

TEST(OverloadPacer, LetsOneAfterTheIntervalPassAtOnce) {
  OverloadPacer pacer;
  pacer.add(kFirst);
  EXPECT_THAT(pacer.take(milliseconds(0)), ElementsAre(kFirst));
  pacer.add(kSecond);
  EXPECT_THAT(pacer.take(milliseconds(1000)), ElementsAre(kSecond));
}

TEST(OverloadPacer, GivesAHeldOneBeforeItIsDueOnRequest) {
  OverloadPacer pacer;
  EXPECT_THAT(pacer.takeRest(), IsEmpty());
  pacer.add(kFirst);
  EXPECT_THAT(pacer.take(milliseconds(0)), ElementsAre(kFirst));
  pacer.add(kSecond);
  EXPECT_THAT(pacer.takeRest(), ElementsAre(kSecond));
  EXPECT_THAT(pacer.takeRest(), IsEmpty());
}

TEST(OverloadPacer, ForgetsAHeldOneWhenCleared) {
  OverloadPacer pacer;
  pacer.add(kFirst);
  pacer.clear();
  EXPECT_THAT(pacer.take(milliseconds(5000)), IsEmpty());
}

TEST(OverloadPacer, KeepsTheVerdictOfTheLongestAndAddsUpWhatWasLost) {
  OverloadPacer pacer;
  for (const double over : {3.0, 9.0, 5.0}) pacer.add(overloadOf("late 41", over));
  const std::vector<Overload> taken = pacer.take(milliseconds(0));
  ASSERT_THAT(taken, SizeIs(1));
  EXPECT_EQ(taken[0].xruns, 3U);
  EXPECT_EQ(taken[0].verdict.overMilliseconds, 9.0);
  EXPECT_EQ(taken[0].verdict.lostMilliseconds, 60.0);
  EXPECT_EQ(taken[0].verdict.values.number("glitch_id"), 9.0);
}

TEST(OverloadPacer, KeepsOverloadsOfDifferentCulpritsApart) {
  OverloadPacer pacer;
  pacer.add(overloadOf("late 41", 3.0));
  pacer.add(overloadOf("stuck 42", 4.0));
  pacer.add(overloadOf("late 41", 1.0));
  EXPECT_THAT(pacer.take(milliseconds(0)), SizeIs(2));
}

TEST(OverloadPacer, AddsUpTheOverloadsOfMoreCulpritsThanItKeepsApart) {
  OverloadPacer pacer;
  for (std::size_t i = 0; i < OverloadPacer::kMaxCulprits + 3; ++i) {
    pacer.add(overloadOf("late " + std::to_string(i), 1.0));
  }
  const std::vector<Overload> taken = pacer.take(milliseconds(0));
  ASSERT_THAT(taken, SizeIs(OverloadPacer::kMaxCulprits));
  EXPECT_EQ(taken.back().xruns, 4U);
  EXPECT_EQ(taken.back().verdict.key, "late " + std::to_string(OverloadPacer::kMaxCulprits - 1));
}

}  // namespace
}  // namespace tonewerk
