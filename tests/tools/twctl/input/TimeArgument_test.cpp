// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/TimeArgument.h"

#include <gtest/gtest.h>

#include "support/ScopedTimeZone.h"

namespace tonewerk {
namespace {

constexpr double kNow = 1'000'000.0;

constexpr const char* kBerlin = "CET-1CEST,M3.5.0,M10.5.0/3";

TEST(TimeArgumentTest, ReadsHowLongAgo) {
  EXPECT_EQ(timeOfArgument("90s", kNow), kNow - 90);
  EXPECT_EQ(timeOfArgument("10m", kNow), kNow - 600);
  EXPECT_EQ(timeOfArgument("1.5h", kNow), kNow - 5400);
  EXPECT_EQ(timeOfArgument("2d", kNow), kNow - 172'800);
  EXPECT_EQ(timeOfArgument("1 hour ago", kNow), kNow - 3600);
  EXPECT_EQ(timeOfArgument("10 min", kNow), kNow - 600);
  EXPECT_EQ(timeOfArgument("2h 30min ago", kNow), kNow - 9000);
  EXPECT_EQ(timeOfArgument("1w2d", kNow), kNow - 777'600);
  EXPECT_EQ(timeOfArgument("-5m", kNow), kNow - 300);
  EXPECT_EQ(timeOfArgument("+5m", kNow), kNow + 300);
  EXPECT_EQ(timeOfArgument("1M", kNow), kNow - 2'629'800);
  EXPECT_EQ(timeOfArgument("500ms", kNow), kNow - 0.5);
}

TEST(TimeArgumentTest, ReadsTimesWithAZone) {
  EXPECT_EQ(timeOfArgument("1970-01-01T00:00:00Z", kNow), 0.0);
  EXPECT_EQ(timeOfArgument("2025-11-20T10:18:00Z", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20 10:18 UTC", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20T10:18Z", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20t10:18:00.5z", kNow), 1'763'633'880.5);
  EXPECT_EQ(timeOfArgument("2025-11-20 11:48:00+01:30", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20T09:18:00-01:00", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2024-02-29T23:59:60Z", kNow), 1'709'251'200.0);
  EXPECT_EQ(timeOfArgument("@1763633880.5", kNow), 1'763'633'880.5);
}

TEST(TimeArgumentTest, ReadsTimesWithoutAZoneAsThoseOfTheProcess) {
  const ScopedTimeZone zone(kBerlin);
  EXPECT_EQ(timeOfArgument("2025-11-20", kNow), 1'763'593'200.0);
  EXPECT_EQ(timeOfArgument("2025-11-20 11:18", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20T11:18:00.5", kNow), 1'763'633'880.5);
  EXPECT_EQ(timeOfArgument("2025-07-01", kNow), 1'751'320'800.0);  // in summer
  constexpr double kNoon = 1'763'636'400.0;                        // 2025-11-20, 12:00 in this zone
  EXPECT_EQ(timeOfArgument("11:18", kNoon), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("11:18:01", kNoon), 1'763'633'881.0);
}

TEST(TimeArgumentTest, KnowsTheDaysAroundNow) {
  const ScopedTimeZone zone(kBerlin);
  constexpr double kNoon = 1'763'636'400.0;  // 2025-11-20, 12:00 in this zone
  EXPECT_EQ(timeOfArgument("now", kNoon), kNoon);
  EXPECT_EQ(timeOfArgument("today", kNoon), 1'763'593'200.0);
  EXPECT_EQ(timeOfArgument("yesterday", kNoon), 1'763'506'800.0);
  EXPECT_EQ(timeOfArgument("tomorrow", kNoon), 1'763'679'600.0);
  constexpr double kAfterChange = 1'761'476'400.0;  // 2025-10-26, 12:00; the clock was set back at 3:00
  EXPECT_EQ(timeOfArgument("yesterday", kAfterChange), 1'761'343'200.0);
  EXPECT_EQ(timeOfArgument("today", kAfterChange), 1'761'429'600.0);
  EXPECT_EQ(timeOfArgument("tomorrow", kAfterChange), 1'761'519'600.0);
}

TEST(TimeArgumentTest, RefusesEverythingElse) {
  for (const char* text : {"",
                           "10",
                           "m",
                           "ago",
                           "1 hour later",
                           "+5m ago",
                           "-5m ago",
                           "--5m",
                           "5 parsecs",
                           "5m x",
                           "1e999d",
                           "nans",
                           "infs",
                           "@",
                           "@now",
                           "@1 ",
                           "@inf",
                           "Yesterday",
                           "yesterday 10:18",
                           "2025-11",
                           "2025-11-20T",
                           "2025-11-20T10",
                           "2025-11-20x10:18",
                           "10:18Z",
                           "25:00",
                           "10:60",
                           "2025-02-29",
                           "2025-13-20T10:18:00Z",
                           "2025-02-29T10:18:00Z",
                           "2025-11-20T24:00:00Z",
                           "2025-11-20T10:60:00Z",
                           "2025-11-20T10:18:61Z",
                           "2025-11-20T10:18:00.Z",
                           "2025-11-20T10:18:00+24:00",
                           "2025-11-20T10:18:00Zx",
                           "2025-11-20T10:18:00+01",
                           "x025-11-20T10:18:00Z"}) {
    EXPECT_FALSE(timeOfArgument(text, kNow)) << text;
  }
}

}  // namespace
}  // namespace tonewerk
