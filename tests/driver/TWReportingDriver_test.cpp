// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingDriver.h"

#include <gtest/gtest.h>

#include "driver/TWReportingIOChannelSubscription.h"

namespace tonewerk {
namespace {

TEST(TWReportingDriverTest, IsDescribedByGroupAndSubGroup) {
  const TWReportingDriver driver = TWReportingDriver::driverWithGroupName("Haptics", "Stats");
  EXPECT_EQ(driver.groupName(), "Haptics");
  EXPECT_EQ(driver.subGroupName(), "Stats");
  EXPECT_EQ(driver.description(), "Haptics-Stats");
}

TEST(TWReportingDriverTest, AnAbsentHalfIsDescribedAsNull) {
  EXPECT_EQ(TWReportingDriver::driverWithGroupName("Speaker", {}).description(), "Speaker-(null)");
  EXPECT_EQ(TWReportingDriver::driverWithGroupName({}, "MCA").description(), "(null)-MCA");
  EXPECT_EQ(TWReportingDriver::driverWithGroupName({}, {}).description(), "(null)-(null)");
}

TEST(TWReportingDriverTest, AnEmptyHalfIsNotAbsent) {
  EXPECT_EQ(TWReportingDriver::driverWithGroupName("", "").description(), "-");
}

TEST(TWReportingIOChannelSubscriptionTest, IsOfItsDriverAndSubscribesNothingAtFirst) {
  const TWReportingIOChannelSubscription made(TWReportingDriver::driverWithGroupName("Speaker", {}));
  EXPECT_EQ(made.driver.description(), "Speaker-(null)");
  EXPECT_EQ(made.subscription, nullptr);
  EXPECT_EQ(made.subscribedChannels, nullptr);
}

}  // namespace
}  // namespace tonewerk
