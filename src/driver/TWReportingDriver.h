// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

namespace tonewerk {

// Names a group of drivers' channels by a group, a subgroup, or both.
class TWReportingDriver {
 public:
  // nullopt stands for every group, or for every subgroup.
  static TWReportingDriver driverWithGroupName(std::optional<std::string> groupName,
                                               std::optional<std::string> subGroupName);

  const std::optional<std::string>& groupName() const { return groupName_; }
  const std::optional<std::string>& subGroupName() const { return subGroupName_; }

  // The group and the subgroup, as in "Haptics-Stats". One that is not named is "(null)". A snapshot uses it
  // as the driver's key.
  std::string description() const;

 private:
  TWReportingDriver(std::optional<std::string> groupName, std::optional<std::string> subGroupName);

  std::optional<std::string> groupName_;
  std::optional<std::string> subGroupName_;
};

}  // namespace tonewerk
