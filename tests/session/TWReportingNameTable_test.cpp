// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingNameTable.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <vector>

#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

TEST(TWReportingNameTableTest, ComposesTheNamesOnce) {
  TWReportingNameTable table;
  EXPECT_EQ(table.audioTag(4, 1), "PlaybackStart");
  EXPECT_TRUE(table.audioTag(4, 1).sharesStorageWith(table.audioTag(4, 1)));
  EXPECT_EQ(table.eventNames(4, 2, 2).first, "com.orvane.tonewerk.Playback.Stop");
  EXPECT_EQ(table.eventNames(4, 2, 2).second, "com.orvane.telephony.Playback.Stop");
  EXPECT_EQ(&table.eventNames(4, 2, 2), &table.eventNames(4, 2, 2));
}

// Values without a text of their own share places in the table. No value may get the name of another.
RC_GTEST_PROP(TWReportingNameTableProperty, GivesEveryCategoryTypeAndServiceItsOwnNames,
              (AudioEventCategory category, AudioEventType anyType, AudioServiceType anyService)) {
  const auto domain =
      *rc::gen::elementOf(std::vector<AudioEventCategory>{0, category & 0xFFFF0000U, 0x20000000U});
  const auto base = *rc::gen::inRange<AudioEventCategory>(0, 20);
  const auto nearType =
      static_cast<AudioEventType>(*rc::gen::elementOf(std::vector<int>{anyType, 65535, anyType % 24}));
  const auto nearService =
      static_cast<AudioServiceType>(*rc::gen::elementOf(std::vector<int>{anyService, anyService % 16}));
  TWReportingNameTable table;
  for (const AudioEventCategory each : {category, domain | base, kCategoryUnknown}) {
    const std::string c = TWReportingUtilityCategoryString(each);
    const std::string t = TWReportingUtilityTypeString(nearType);
    const std::string s = TWReportingUtilityGenerateServiceNameFromServiceType(nearService);
    RC_ASSERT(table.audioTag(each, nearType).string() == c + t);
    const auto& names = table.eventNames(each, nearType, nearService);
    std::string ending = ".";
    ending += c;
    ending += '.';
    ending += t;
    std::string ofService = "com.orvane.";
    ofService += s;
    ofService += ending;
    RC_ASSERT(names.first.string() == "com.orvane.tonewerk" + ending);
    RC_ASSERT(names.second.string() == ofService);
  }
}

}  // namespace
}  // namespace tonewerk
