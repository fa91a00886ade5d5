// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/LinuxSystemInformation.h"

#include <cstdlib>
#include <ctime>

#include "platform/linux/files/TextFile.h"
#include "platform/linux/system/ThermalZones.h"

namespace tonewerk {
namespace {

bool isLowProfile(const std::string& acpiDirectory) {
  std::string profile;
  if (readTextFile(acpiDirectory + "/platform_profile", profile)) return false;
  if (profile == "low-power\n") return true;
  if (profile != "quiet\n") return false;
  std::string choices;
  if (readTextFile(acpiDirectory + "/platform_profile_choices", choices)) return false;
  return choices.find("low-power") == std::string::npos;
}

std::array<double, 3> readLoadAverages() {
  std::array<double, 3> averages{};
  if (getloadavg(averages.data(), 3) != 3) return {};
  return averages;
}

}  // namespace

LinuxSystemInformation::LinuxSystemInformation(const Clock& clock, std::string sysDirectory,
                                               std::string busAddress)
    : clock_(clock),
      sysDirectory_(std::move(sysDirectory)),
      watcher_([this](bool isPowerSaver) { isPowerSaver_ = isPowerSaver; }, std::move(busAddress)) {}

int LinuxSystemInformation::thermalLevel() const { return reading().thermalLevel; }

bool LinuxSystemInformation::isLowPowerModeEnabled() const {
  return isPowerSaver_ || reading().isPlatformProfileLow;
}

LinuxSystemInformation::Reading LinuxSystemInformation::reading() const {
  const std::chrono::nanoseconds now = clock_.monotonic();
  const MutexLock lock(mutex_);
  if (!reading_ || now - reading_->at > kMaxAge) {
    reading_ = Reading{now, thermalLevelOf(sysDirectory_ + "/class/thermal"),
                       isLowProfile(sysDirectory_ + "/firmware/acpi"), readLoadAverages()};
  }
  return *reading_;
}

std::array<double, 3> LinuxSystemInformation::loadAverages() const { return reading().loadAverages; }

double LinuxSystemInformation::uptimeSeconds() const {
  timespec time{};
  clock_gettime(CLOCK_BOOTTIME, &time);
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

}  // namespace tonewerk
