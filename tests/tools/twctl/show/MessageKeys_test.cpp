// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/MessageKeys.h"

#include <gtest/gtest.h>
#include <string>

#include "values/Value.h"

namespace tonewerk {
namespace {

TEST(MessageKeysTest, ShowWhatPeopleLookForFirst) {
  EXPECT_EQ(keysThatMatter({{"mFormatID", "lpcm"},
                            {"active_devices", "Speaker"},
                            {"QMSessionVolume", 0.5},
                            {"play_seconds", 10.100000381469727}}),
            "play_seconds=10.1 QMSessionVolume=0.5 active_devices=Speaker mFormatID=lpcm");
}

TEST(MessageKeysTest, LeaveOutWhatSaysNothing) {
  EXPECT_EQ(keysThatMatter({{"twreporting_timestamp", 1.0},
                            {"audiotag", "VolumeSummary"},
                            {"HostApplicationDisplayID", "a"},
                            {"invalid_timestamp", "nil"},
                            {"vp_config_input_port", "unknown"},
                            {"play_secondsBucketed", "10"},
                            {"route", "Speaker"}}),
            "route=Speaker");
  EXPECT_EQ(keysThatMatter({}), "");
}

TEST(MessageKeysTest, ShowTheFirstEightAndThatThereAreMore) {
  ValueMap payload;
  for (const char* key : {"a", "b", "c", "d", "e", "f", "g", "h"}) payload.set(key, 1);
  EXPECT_EQ(keysThatMatter(payload), "a=1 b=1 c=1 d=1 e=1 f=1 g=1 h=1");
  payload.set("i", 1);
  EXPECT_EQ(keysThatMatter(payload), "a=1 b=1 c=1 d=1 e=1 f=1 g=1 h=1 \u2026");
}

TEST(MessageKeysTest, QuoteTextsWithSpaces) {
  EXPECT_EQ(keysThatMatter(
                {{"format", "48000 Hz, 2 ch"}, {"empty", ""}, {"large", 1e300}, {"list", ValueArray{1, 2}}}),
            "format=\"48000 Hz, 2 ch\" empty=\"\" large=1e+300 list=[1,2]");
}

}  // namespace
}  // namespace tonewerk
