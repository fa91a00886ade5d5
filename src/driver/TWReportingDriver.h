// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

namespace tonewerk {

// A group of drivers' channels: a group, a subgroup, or both.
class TWReportingDriver {
 public:
  // None: every group, every subgroup.
  static TWReportingDriver driverWithGroupName(std::optional<std::string> groupName,
                                               std::optional<std::string> subGroupName);

  const std::optional<std::string>& groupName() const { return groupName_; }
  const std::optional<std::string>& subGroupName() const { return subGroupName_; }

  // "Haptics-Stats"; an absent half is "(null)". The driver's key in a snapshot.
  std::string description() const;

 private:
  TWReportingDriver(std::optional<std::string> groupName, std::optional<std::string> subGroupName);

  std::optional<std::string> groupName_;
  std::optional<std::string> subGroupName_;
};

}  // namespace tonewerk
