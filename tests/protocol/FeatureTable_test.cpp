// SPDX-License-Identifier: Apache-2.0
#include "protocol/FeatureTable.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(FeatureTableTest, AFollowedPreferenceHasItsNotification) {
  EXPECT_EQ(notificationOfPreference("com.orvane.homedeck", "spatial-audio-accessory-feature"),
            "com.orvane.homedeck.spatial-audio-accessory-feature.changed");
  EXPECT_EQ(notificationOfPreference("com.orvane.tonewerk", "device_name"), "com.orvane.tonewerk.reporting");
}

TEST(FeatureTableTest, OneNotificationAnnouncesAllOfTheDaemonsPreferences) {
  EXPECT_EQ(notificationOfPreference("com.orvane.tonewerk", "disable_reporting"),
            "com.orvane.tonewerk.reporting");
}

TEST(FeatureTableTest, OtherPreferencesHaveNoNotification) {
  EXPECT_EQ(notificationOfPreference("com.orvane.homedeck", "device_name"), std::nullopt);
  EXPECT_EQ(notificationOfPreference("com.orvane.homedeck", "ringerstate"), std::nullopt);
  EXPECT_EQ(notificationOfPreference("", "ringerstate"), std::nullopt);
  EXPECT_EQ(notificationOfPreference("com.orvane.tonewerk.store", "device_name"), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
