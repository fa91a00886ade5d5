// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/ReporterIdentifiers.h"

#include <gtest/gtest.h>
#include <set>

#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kExactInDoubles = std::int64_t{1} << 53;

TEST(ReporterIdentifiers, AreDifferentWhileTheClockStopsOrGoesBack) {
  ManualClock clock;
  ReporterIdentifiers identifiers(clock, 4711);
  std::set<std::int64_t> seen;
  for (int i = 0; i < 1000; ++i) EXPECT_TRUE(seen.insert(identifiers.next()).second);
  clock.setNow(1000.0);
  for (int i = 0; i < 1000; ++i) EXPECT_TRUE(seen.insert(identifiers.next()).second);
}

TEST(ReporterIdentifiers, DifferFromThoseOfAnEarlierRunWithTheSameProcessIdentifier) {
  ManualClock clock;
  const std::int64_t earlier = ReporterIdentifiers(clock, 1).next();
  clock.advance(0.001);
  EXPECT_NE(ReporterIdentifiers(clock, 1).next(), earlier);
}

TEST(ReporterIdentifiers, DifferBetweenTwoBridgesAtTheSameTime) {
  ManualClock clock;
  EXPECT_NE(ReporterIdentifiers(clock, 1000).next(), ReporterIdentifiers(clock, 1001).next());
}

TEST(ReporterIdentifiers, StayInRangeForAnyClock) {
  for (const double now : {-5.0, 0.0, ManualClock::kStart, 8.7e9, 1e30}) {
    const ManualClock clock(now);
    for (const std::int64_t process : {std::int64_t{0}, std::int64_t{1}, std::int64_t{4'194'303}}) {
      const std::int64_t identifier = ReporterIdentifiers(clock, process).next();
      EXPECT_GT(identifier, 1) << now;
      EXPECT_LE(identifier, kExactInDoubles) << now;
    }
  }
}

}  // namespace
}  // namespace tonewerk
