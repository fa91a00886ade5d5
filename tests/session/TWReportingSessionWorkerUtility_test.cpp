// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionWorkerUtility.h"

#include <array>
#include <cmath>
#include <gtest/gtest.h>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;

class CombineRapidMessagesTest : public ReportingTest {
 protected:
  static TWReportingSessionMessages combine(const TWReportingSessionMessages& messages, double pause) {
    static constexpr std::array<std::string_view, 3> kKeys{"K1", "K2", "K3"};
    return TWReportingSessionWorkerUtility::combineRapidMessages(messages, kKeys, pause);
  }
};

TEST_F(CombineRapidMessagesTest, MergesABurstIntoItsFirstMessageUntilAKeyComesAgain) {
  const TWReportingSessionMessages messages{messageAt(0, {{"K1", 1}, {"n", "a"}}),
                                            messageAt(0.5, {{"K2", 2}, {"n", "b"}}),
                                            messageAt(0.9, {{"K1", 3}, {"n", "c"}})};
  const auto result = combine(messages, 1.0);
  ASSERT_EQ(result.size(), 2U);
  EXPECT_EQ(result[0], messages[0]);  // the input's own record, changed in place
  EXPECT_EQ(messages[0]->message,
            (ValueMap{{"K1", 1}, {"K2", 2}, {"n", "b"}, {"twreporting_timestamp", 0.5}}));
  EXPECT_EQ(result[1], messages[2]);
  EXPECT_EQ(messages[2]->message.integer("K1"), 3);
}

TEST_F(CombineRapidMessagesTest, DoesNotMergeAMessageAfterALongPauseAndContinuesTheBurst) {
  const auto result = combine({messageAt(0, {{"K1", 1}, {"n", "a"}}), messageAt(5, {{"K2", 2}, {"n", "b"}}),
                               messageAt(5.5, {{"K3", 3}, {"n", "c"}})},
                              1.0);
  EXPECT_THAT(textsUnder("n", result), ElementsAre("a", "b", "c"));
}

TEST_F(CombineRapidMessagesTest, MeasuresEachPauseFromTheLastMergedMessage) {
  const auto result =
      combine({messageAt(0, {{"K1", 1}}), messageAt(0.9, {{"K2", 2}}), messageAt(1.8, {{"K3", 3}})}, 1.0);
  ASSERT_EQ(result.size(), 1U);
  EXPECT_EQ(result[0]->epochTime(), 1.8);
}

TEST_F(CombineRapidMessagesTest, APauseOfTheMaximumIsTooLong) {
  EXPECT_EQ(combine({messageAt(0, {{"K1", 1}}), messageAt(1, {{"K2", 2}})}, 1.0).size(), 2U);
}

TEST_F(CombineRapidMessagesTest, APauseThatIsNotANumberIsTooLong) {
  EXPECT_EQ(combine({messageAt(0, {{"K1", 1}}), messageAt(std::nan(""), {{"K2", 2}})}, 1.0).size(), 2U);
}

TEST_F(CombineRapidMessagesTest, MessagesWithoutTheKeysPassAndDoNotEndABurst) {
  const auto result = combine(
      {messageAt(0, {{"K1", 1}, {"n", "a"}}), messageAt(0.1, {{"n", "b"}}), messageAt(0.2, {{"K2", 2}})},
      1.0);
  EXPECT_THAT(textsUnder("n", result), ElementsAre("a", "b"));
  EXPECT_EQ(result[0]->message.integer("K2"), 2);
}

TEST_F(CombineRapidMessagesTest, TheFirstKeyOfTheListCountsForAMessageThatHoldsSeveral) {
  const auto result = combine({messageAt(0, {{"K1", 1}}), messageAt(0.1, {{"K2", 2}, {"K1", 2}})}, 1.0);
  EXPECT_EQ(result.size(), 2U);  // K1 comes again
}

TEST_F(CombineRapidMessagesTest, ReturnsNothingForNoMessages) { EXPECT_TRUE(combine({}, 1.0).empty()); }

TEST(VidroXYErrorTest, IsAMessageThatHasAKeyWithThatPrefix) {
  const auto isError = [](const ValueMap& payload) {
    return TWReportingSessionWorkerUtility::isVidroXYerrorMessage(TWReportingSessionMessage(payload, 4, 1));
  };
  EXPECT_TRUE(isError({{"a", 1}, {"vdac_invalid_x", 1}}));
  EXPECT_TRUE(isError({{"vdac_invalid_", 1}}));
  EXPECT_FALSE(isError({{"vdac_invalid", 1}, {"a_vdac_invalid_x", 1}, {"VDAC_INVALID_x", 1}}));
  EXPECT_FALSE(isError({}));
}

}  // namespace
}  // namespace tonewerk
