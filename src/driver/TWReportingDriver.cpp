// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingDriver.h"

#include <utility>

namespace tonewerk {

TWReportingDriver::TWReportingDriver(std::optional<std::string> groupName,
                                     std::optional<std::string> subGroupName)
    : groupName_(std::move(groupName)), subGroupName_(std::move(subGroupName)) {}

TWReportingDriver TWReportingDriver::driverWithGroupName(std::optional<std::string> groupName,
                                                         std::optional<std::string> subGroupName) {
  return {std::move(groupName), std::move(subGroupName)};
}

std::string TWReportingDriver::description() const {
  return groupName_.value_or("(null)") + "-" + subGroupName_.value_or("(null)");
}

}  // namespace tonewerk
