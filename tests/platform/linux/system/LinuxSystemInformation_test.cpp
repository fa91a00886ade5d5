// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/LinuxSystemInformation.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

struct TripPoint {
  std::string type;
  int temperature;  // in thousandths of a degree Celsius
};

// A /sys with files of the test, and no D-Bus.
class LinuxSystemInformationTest : public testing::Test {
 protected:
  void write(const std::string& name, const std::string& text) {
    const std::string path = sys_.path(name);
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    std::ofstream(path) << text << '\n';
  }

  void makeZone(int number, int temperature, const std::vector<TripPoint>& points) {
    const std::string zone = "class/thermal/thermal_zone" + std::to_string(number);
    write(zone + "/temp", std::to_string(temperature));
    for (std::size_t at = 0; at < points.size(); ++at) {
      write(zone + "/trip_point_" + std::to_string(at) + "_type", points[at].type);
      write(zone + "/trip_point_" + std::to_string(at) + "_temp", std::to_string(points[at].temperature));
    }
  }

  // Moves the clock beyond the age at which values are read again.
  int thermalLevel() {
    clock_.advance(1.5);
    return system_.thermalLevel();
  }
  bool isLowPower() {
    clock_.advance(1.5);
    return system_.isLowPowerModeEnabled();
  }

  TemporaryDirectory sys_;
  ManualClock clock_;
  LinuxSystemInformation system_{clock_, sys_.path(), "unix:path=" + sys_.path("no-bus")};
};

TEST_F(LinuxSystemInformationTest, WithoutZonesOrTripPointsItIsNominal) {
  EXPECT_EQ(thermalLevel(), 0);
  makeZone(0, 99'000, {});
  EXPECT_EQ(thermalLevel(), 0);
}

TEST_F(LinuxSystemInformationTest, TheHighestTripPointThatIsReachedCounts) {
  const std::vector<TripPoint> points = {
      {"critical", 100'000}, {"hot", 90'000}, {"passive", 80'000}, {"active", 60'000}};
  const std::vector<std::pair<int, int>> expected = {{59'999, 0}, {60'000, 1}, {80'000, 1},  {89'999, 1},
                                                     {90'000, 2}, {99'999, 2}, {100'000, 3}, {-5'000, 0}};
  for (const auto& [temperature, level] : expected) {
    makeZone(0, temperature, points);
    EXPECT_EQ(thermalLevel(), level) << temperature;
  }
}

TEST_F(LinuxSystemInformationTest, TheHottestZoneCounts) {
  makeZone(0, 50'000, {{"passive", 80'000}});
  makeZone(1, 95'000, {{"hot", 90'000}});
  makeZone(2, 85'000, {{"passive", 80'000}});
  EXPECT_EQ(thermalLevel(), 2);
}

TEST_F(LinuxSystemInformationTest, DisabledUnsetAndUnreadableOnesDoNotCount) {
  makeZone(0, 99'000, {{"critical", 90'000}});
  write("class/thermal/thermal_zone0/mode", "disabled");
  makeZone(1, 50'000, {{"critical", 0}, {"hot", -274'000}, {"strange", 10'000}});
  makeZone(2, 0, {{"critical", 90'000}});
  write("class/thermal/thermal_zone2/temp", "no number");
  write("class/thermal/cooling_device0/cur_state", "1");
  EXPECT_EQ(thermalLevel(), 0);
  write("class/thermal/thermal_zone0/mode", "enabled");
  EXPECT_EQ(thermalLevel(), 3);
}

TEST_F(LinuxSystemInformationTest, ReadsSensorsAtMostOnceASecond) {
  EXPECT_EQ(thermalLevel(), 0);
  makeZone(0, 99'000, {{"hot", 90'000}});
  EXPECT_EQ(system_.thermalLevel(), 0);
  clock_.advance(LinuxSystemInformation::kMaxAge);
  EXPECT_EQ(system_.thermalLevel(), 0);
  clock_.advance(0.1);
  EXPECT_EQ(system_.thermalLevel(), 2);
}

TEST_F(LinuxSystemInformationTest, WithoutASourceLowPowerModeIsOff) { EXPECT_FALSE(isLowPower()); }

TEST_F(LinuxSystemInformationTest, TheFirmwaresLowPowerProfileIsLowPowerMode) {
  write("firmware/acpi/platform_profile_choices", "low-power quiet balanced performance");
  for (const auto& [profile, isLow] : std::vector<std::pair<std::string, bool>>{
           {"low-power", true}, {"quiet", false}, {"balanced", false}, {"performance", false}}) {
    write("firmware/acpi/platform_profile", profile);
    EXPECT_EQ(isLowPower(), isLow) << profile;
  }
}

TEST_F(LinuxSystemInformationTest, TheQuietProfileCountsIfThereIsNoLowPowerProfile) {
  write("firmware/acpi/platform_profile_choices", "quiet balanced performance");
  write("firmware/acpi/platform_profile", "quiet");
  EXPECT_TRUE(isLowPower());
}

TEST_F(LinuxSystemInformationTest, TellsLoadAndUptime) {
  for (const double average : system_.loadAverages()) EXPECT_GE(average, 0.0);
  const double before = system_.uptimeSeconds();
  EXPECT_GT(before, 0.0);
  EXPECT_GE(system_.uptimeSeconds(), before);
}

}  // namespace
}  // namespace tonewerk
