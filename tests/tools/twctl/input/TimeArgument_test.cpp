// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/TimeArgument.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

constexpr double kNow = 1'000'000.0;

TEST(TimeArgumentTest, ReadsHowLongAgo) {
  EXPECT_EQ(timeOfArgument("90s", kNow), kNow - 90);
  EXPECT_EQ(timeOfArgument("10m", kNow), kNow - 600);
  EXPECT_EQ(timeOfArgument("1.5h", kNow), kNow - 5400);
  EXPECT_EQ(timeOfArgument("2d", kNow), kNow - 172'800);
}

TEST(TimeArgumentTest, ReadsTimes) {
  EXPECT_EQ(timeOfArgument("1970-01-01T00:00:00Z", kNow), 0.0);
  EXPECT_EQ(timeOfArgument("2025-11-20T10:18:00Z", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20t10:18:00.5z", kNow), 1'763'633'880.5);
  EXPECT_EQ(timeOfArgument("2025-11-20 11:48:00+01:30", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2025-11-20T09:18:00-01:00", kNow), 1'763'633'880.0);
  EXPECT_EQ(timeOfArgument("2024-02-29T23:59:60Z", kNow), 1'709'251'200.0);
}

TEST(TimeArgumentTest, RefusesEverythingElse) {
  for (const char* text : {"",
                           "10",
                           "m",
                           "-5m",
                           "10 m",
                           "10min",
                           "1e999d",
                           "nans",
                           "now",
                           "2025-11-20",
                           "2025-11-20T10:18:00",
                           "2025-11-20T10:18Z",
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
