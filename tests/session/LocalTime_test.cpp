// SPDX-License-Identifier: Apache-2.0
#include "session/LocalTime.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using std::chrono::minutes;

TEST(LocalTimeTest, ShowsTheLocalTimeAndItsOffset) {
  constexpr double kMorning = 1'795'169'880.9;  // 2026-11-20T10:18:00.9Z
  EXPECT_EQ(localTimeText(kMorning, minutes(0)), "20261120-101800+0000");
  EXPECT_EQ(localTimeText(kMorning, minutes(60)), "20261120-111800+0100");
  EXPECT_EQ(localTimeText(kMorning, minutes(-210)), "20261120-064800-0330");
  EXPECT_EQ(localTimeText(kMorning, minutes(14 * 60)), "20261121-001800+1400");
}

}  // namespace
}  // namespace tonewerk
