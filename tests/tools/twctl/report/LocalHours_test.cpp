// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/LocalHours.h"

#include <gmock/gmock.h>
#include <limits>
#include <optional>
#include <stdlib.h>
#include <string>
#include <time.h>

namespace tonewerk {
namespace {

constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();

class LocalHoursTest : public testing::Test {
 protected:
  LocalHoursTest() {
    if (const char* zone = getenv("TZ")) before_ = zone;
  }
  void TearDown() override {
    before_ ? setenv("TZ", before_->c_str(), 1) : unsetenv("TZ");
    tzset();
  }
  static void setZone(const char* zone) {
    setenv("TZ", zone, 1);
    tzset();
  }

 private:
  std::optional<std::string> before_;
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

}  // namespace
}  // namespace tonewerk
