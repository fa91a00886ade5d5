// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/SessionRates.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::SizeIs;

ValueMap session(std::int64_t reporterID, std::uint64_t messages, std::uint64_t redundant = 0,
                 std::int64_t process = 11) {
  return {{"reporterID", reporterID},
          {"processIdentifier", process},
          {"messages", messages},
          {"redundant", redundant}};
}

std::vector<std::int64_t> orderOf(const std::vector<SessionRow>& rows) {
  std::vector<std::int64_t> order;
  for (const SessionRow& row : rows) order.push_back(row.session.integer("reporterID"));
  return order;
}

TEST(SessionRatesTest, KnowsNoRateAtFirst) {
  SessionRates rates;
  const auto rows = rates.rowsOf({session(7, 100)}, 5);
  ASSERT_THAT(rows, SizeIs(1));
  EXPECT_EQ(rows[0].messagesPerSecond, std::nullopt);
}

TEST(SessionRatesTest, CountsWhatCameBetweenTwoListings) {
  SessionRates rates;
  rates.rowsOf({session(7, 100)}, 5);
  EXPECT_EQ(rates.rowsOf({session(7, 130)}, 7).at(0).messagesPerSecond, 15.0);
  EXPECT_EQ(rates.rowsOf({session(7, 130)}, 8).at(0).messagesPerSecond, 0.0);
}

TEST(SessionRatesTest, ANewSessionAndOneThatWasStoppedReceivedEverythingSince) {
  SessionRates rates;
  rates.rowsOf({session(7, 100)}, 5);
  const auto rows = rates.rowsOf({session(7, 10), session(8, 4)}, 7);
  EXPECT_EQ(rows.at(0).messagesPerSecond, 5.0);
  EXPECT_EQ(rows.at(1).messagesPerSecond, 2.0);
}

TEST(SessionRatesTest, KnowsNoRateWhenNoTimeHasPassed) {
  SessionRates rates;
  rates.rowsOf({session(7, 100)}, 5);
  EXPECT_EQ(rates.rowsOf({session(7, 130)}, 5).at(0).messagesPerSecond, std::nullopt);
}

TEST(SessionRatesTest, TellsSessionsOfOneIdentifierApart) {
  SessionRates rates;
  rates.rowsOf({session(7, 100, 0, 11), session(7, 50, 0, 12), session(7, 10, 0, 12)}, 5);
  const auto rows = rates.rowsOf({session(7, 101, 0, 11), session(7, 52, 0, 12), session(7, 13, 0, 12)}, 6);
  ASSERT_THAT(rows, SizeIs(3));
  EXPECT_EQ(rows[0].messagesPerSecond, 3.0);
  EXPECT_EQ(rows[1].messagesPerSecond, 2.0);
  EXPECT_EQ(rows[2].messagesPerSecond, 1.0);
}

TEST(SessionRatesTest, PutsTheBusiestFirstThenTheLowestIdentifier) {
  SessionRates rates;
  EXPECT_THAT(orderOf(rates.rowsOf({session(9, 0), session(7, 0), session(8, 0)}, 1)), ElementsAre(7, 8, 9));
  EXPECT_THAT(orderOf(rates.rowsOf({session(9, 5), session(7, 1), session(8, 5)}, 2)), ElementsAre(8, 9, 7));
}

TEST(SessionRatesTest, TheRedundantShareIsOfAllMessages) {
  SessionRates rates;
  const auto rows = rates.rowsOf({session(7, 8, 2), session(8, 0)}, 1);
  EXPECT_EQ(rows.at(0).redundantShare, 0.25);
  EXPECT_EQ(rows.at(1).redundantShare, std::nullopt);
}

}  // namespace
}  // namespace tonewerk
