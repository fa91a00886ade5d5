// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/LocalTime.h"

#include <gtest/gtest.h>
#include <limits>

#include "support/ScopedTimeZone.h"
#include "tools/twctl/input/TimeArgument.h"

namespace tonewerk {
namespace {

// As in central Europe.
constexpr const char* kZone = "CET-1CEST,M3.5.0,M10.5.0/3";
constexpr double kTenEighteen = 1'763'633'880.0;     // 2025-11-20T10:18:00Z
constexpr double kClockIsSetBack = 1'792'890'000.0;  // 2026-10-25T01:00:00Z

TEST(LocalTimeTest, ShowsTheZoneOfTheProcess) {
  const ScopedTimeZone zone(kZone);
  EXPECT_EQ(localTime(kTenEighteen), "2025-11-20 11:18:00");
  EXPECT_EQ(localTime(kTenEighteen + 0.5), "2025-11-20 11:18:00.500");
  EXPECT_EQ(localSecond(kTenEighteen + 0.5), "2025-11-20 11:18:00");
}

TEST(LocalTimeTest, SaysWhenItIsUtc) {
  const ScopedTimeZone zone("UTC0");
  EXPECT_EQ(localTime(kTenEighteen + 0.5), "2025-11-20 10:18:00.500Z");
}

TEST(LocalTimeTest, TellsTheTwoHoursApartThatTheClockShowsTwice) {
  const ScopedTimeZone zone(kZone);
  EXPECT_EQ(localTime(kClockIsSetBack - 3601), "2026-10-25 01:59:59");
  EXPECT_EQ(localTime(kClockIsSetBack - 1800), "2026-10-25 02:30:00+02:00");
  EXPECT_EQ(localTime(kClockIsSetBack + 1800), "2026-10-25 02:30:00+01:00");
  EXPECT_EQ(localTime(kClockIsSetBack + 3600), "2026-10-25 03:00:00");
}

TEST(LocalTimeTest, TimeOptionsReadTheSameTimeFromIt) {
  for (const char* name : {kZone, "UTC0", "NZST-12NZDT,M9.5.0,M4.1.0/3", "AAA11:30"}) {
    const ScopedTimeZone zone(name);
    for (double time = kClockIsSetBack - 86'400; time < kClockIsSetBack + 86'400; time += 599.5) {
      EXPECT_EQ(timeOfArgument(localTime(time), 0.0), time) << name << ' ' << localTime(time);
    }
  }
}

TEST(LocalTimeTest, ShowsSomethingForAnyNumber) {
  const ScopedTimeZone zone(kZone);
  for (const double time :
       {-1e300, -62'167'219'200.0, 253'402'300'799.0, 1e300, std::numeric_limits<double>::quiet_NaN(),
        std::numeric_limits<double>::infinity()}) {
    EXPECT_GE(localTime(time).size(), 19U) << time;
  }
  EXPECT_EQ(localTime(-0.25), "1970-01-01 00:59:59.750");
}

}  // namespace
}  // namespace tonewerk
