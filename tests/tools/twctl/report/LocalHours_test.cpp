// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/LocalHours.h"

#include <gmock/gmock.h>
#include <limits>
#include <optional>

#include "support/ScopedTimeZone.h"

namespace tonewerk {
namespace {

constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();

class LocalHoursTest : public testing::Test {
 protected:
  void setZone(const char* zone) {
    zone_.reset();
    zone_.emplace(zone);
  }

 private:
  std::optional<ScopedTimeZone> zone_;
};

TEST_F(LocalHoursTest, DividesAStretchAmongTheHoursOfTheClock) {
  setZone("UTC");
  const LocalOffsets offsets(0.0, 100'000.0);
  LocalHours hours(offsets, 0.0);
  hours.add(3000.0, 9000.0, 3000.0, 0.5);  // played half of the time
  hours.add(8000.0, 8100.0, 100.0, kUnknown);
  ASSERT_EQ(hours.hours().size(), 3U);
  EXPECT_DOUBLE_EQ(hours.hours().at(0).seconds, 300.0);
  EXPECT_DOUBLE_EQ(hours.hours().at(3600).seconds, 1800.0);
  EXPECT_DOUBLE_EQ(hours.hours().at(7200).seconds, 1000.0);
  EXPECT_DOUBLE_EQ(hours.hours().at(7200).withVolume, 900.0);
  EXPECT_DOUBLE_EQ(hours.hours().at(7200).volumeSeconds, 450.0);
}

TEST_F(LocalHoursTest, LeavesOutWhatIsBeforeItsBeginning) {
  setZone("UTC");
  const LocalOffsets offsets(0.0, 100'000.0);
  LocalHours hours(offsets, 7200.0);
  hours.add(0.0, 10'800.0, 10'800.0, 1.0);
  hours.add(100.0, 100.0, 5.0, 1.0);
  ASSERT_EQ(hours.hours().size(), 1U);
  EXPECT_DOUBLE_EQ(hours.hours().at(7200).seconds, 3600.0);
}

TEST_F(LocalHoursTest, IgnoresTimesThatNoClockHas) {
  setZone("UTC");
  const LocalOffsets offsets(-1e300, 1e300);
  LocalHours hours(offsets, 0.0);
  hours.add(-5.0, 1e300, 1.0, 1.0);
  hours.add(1e300, 1e300, 1.0, 1.0);
  hours.add(kUnknown, 5.0, 1.0, 1.0);
  EXPECT_THAT(hours.hours(), testing::IsEmpty());
}

TEST_F(LocalHoursTest, BeginsHoursWhereTheZoneDoes) {
  setZone("XXX-5:30");
  const LocalOffsets offsets(0.0, 100'000.0);
  LocalHours hours(offsets, 0.0);
  hours.add(3600.0, 5400.0, 1800.0, 1.0);
  ASSERT_EQ(hours.hours().size(), 1U);
  EXPECT_EQ(hours.hours().begin()->first, 1800);
}

TEST_F(LocalHoursTest, FindsTheChangesOfTheZoneToTheSecond) {
  setZone("CET-1CEST,M3.5.0,M10.5.0/3");
  const LocalOffsets offsets(1'772'000'000.0, 1'795'176'000.5);  // 2026-02-25 to 2026-11-20
  ASSERT_EQ(offsets.changes().size(), 3U);
  EXPECT_EQ(offsets.changes()[1].from, 1'774'746'000.0);
  EXPECT_EQ(offsets.changes()[2].from, 1'792'890'000.0);
  EXPECT_EQ(offsets.at(1'774'745'999.0), 3600);
  EXPECT_EQ(offsets.at(1'774'746'000.0), 7200);
  EXPECT_EQ(offsets.at(1'795'000'000.0), 3600);
  EXPECT_EQ(offsets.zone(), "CET");
}

TEST_F(LocalHoursTest, APartOfTheClockThatComesTwiceIsOnePart) {
  setZone("Europe/Berlin");
  constexpr std::int64_t kTwice = 1'792'886'400;  // 2026-10-25 02:00 CEST; an hour later it is 02:00 CET
  const LocalOffsets offsets(kTwice - 86'400.0, kTwice + 86'400.0);
  for (const double seconds : {0.0, 1800.0, 3600.0, 7199.0}) {
    const LocalOffsets::Part part = offsets.partAt(kTwice + seconds, LocalOffsets::kHour);
    EXPECT_EQ(part.from, kTwice) << seconds;
    EXPECT_EQ(part.until, kTwice + 7200) << seconds;
  }
  EXPECT_EQ(offsets.partAt(kTwice - 1, LocalOffsets::kHour).until, kTwice);
  EXPECT_EQ(offsets.partAt(kTwice + 7200, LocalOffsets::kHour).from, kTwice + 7200);
  LocalHours hours(offsets, 0.0);
  hours.add(kTwice - 1800.0, kTwice + 9000.0, 10'800.0, 0.5);
  ASSERT_EQ(hours.hours().size(), 3U);
  EXPECT_DOUBLE_EQ(hours.hours().at(kTwice).seconds, 7200.0);
}

TEST_F(LocalHoursTest, ADayBeginsWhenTheClockShowsIt) {
  setZone("Africa/Cairo");  // 2026-04-24 has no time from 00:00 to 01:00
  constexpr std::int64_t kChange = 1'776'981'600;
  const LocalOffsets offsets(kChange - 172'800.0, kChange + 172'800.0);
  const LocalOffsets::Part day = offsets.partAt(kChange + 40'000, LocalOffsets::kDay);
  EXPECT_EQ(day.from, kChange);
  EXPECT_EQ(day.until, kChange + 82'800);  // 23 hours
  EXPECT_EQ(offsets.partAt(kChange - 1, LocalOffsets::kDay).until, kChange);
}

TEST_F(LocalHoursTest, AWeekBeginsOnMonday) {
  setZone("UTC");
  const LocalOffsets offsets(0.0, 1'795'132'800.0);
  EXPECT_EQ(offsets.partAt(1'795'132'800, LocalOffsets::kWeek).from, 1'794'787'200);  // 2026-11-16
  EXPECT_EQ(offsets.partAt(10.0, LocalOffsets::kWeek).from, -3 * 86'400);
}

}  // namespace
}  // namespace tonewerk
