// SPDX-License-Identifier: Apache-2.0
#include "platform/JournalPosition.h"

#include <gtest/gtest.h>
#include <thread>

namespace tonewerk {
namespace {

using Row = JournalPosition::Row;

TEST(JournalPositionTest, RowsOfARequestAreCounted) {
  JournalPosition position(7);
  const JournalPosition::Scope scope(position);
  EXPECT_EQ(JournalPosition::nextRow(), (Row{7, 1}));
  EXPECT_EQ(JournalPosition::nextRow(), (Row{7, 2}));
}

TEST(JournalPositionTest, ARowOfNoRequestHasNoNumber) {
  EXPECT_EQ(JournalPosition::nextRow(), Row());
  JournalPosition none;
  const JournalPosition::Scope scope(none);
  EXPECT_EQ(JournalPosition::nextRow(), Row());
}

TEST(JournalPositionTest, ACopyCountsOn) {
  JournalPosition first(7);
  JournalPosition later;
  {
    const JournalPosition::Scope scope(first);
    (void)JournalPosition::nextRow();
    later = JournalPosition::current();
  }
  const JournalPosition::Scope scope(later);
  EXPECT_EQ(JournalPosition::nextRow(), (Row{7, 2}));
}

TEST(JournalPositionTest, ScopesNestAndBelongToTheirThread) {
  JournalPosition outer(7);
  const JournalPosition::Scope scope(outer);
  {
    JournalPosition inner(8);
    const JournalPosition::Scope nested(inner);
    EXPECT_EQ(JournalPosition::nextRow(), (Row{8, 1}));
  }
  EXPECT_EQ(JournalPosition::nextRow(), (Row{7, 1}));
  std::thread([] { EXPECT_EQ(JournalPosition::nextRow(), Row()); }).join();
}

TEST(JournalPositionTest, LaterRequestsAreAfterAllRowsOfEarlierOnes) {
  EXPECT_LT((Row{7, 9}), (Row{8, 1}));
  EXPECT_LT((Row{8, 1}), (Row{8, 2}));
}

}  // namespace
}  // namespace tonewerk
