// SPDX-License-Identifier: Apache-2.0
#include "client/ReplyTable.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

ReplyTable::Entry entry(AnswerKind kind) { return {{nullptr, nullptr, kind, false}, nullptr, false}; }

TEST(ReplyTableTest, GivesAnEntryOnce) {
  ReplyTable table;
  const std::uint32_t one = table.add(entry(AnswerKind::kValidity));
  const std::uint32_t other = table.add(entry(AnswerKind::kPlain));
  EXPECT_NE(one, other);
  EXPECT_NE(one, 0U);
  EXPECT_EQ(table.take(one)->reply.kind, AnswerKind::kValidity);
  EXPECT_FALSE(table.take(one));
  EXPECT_FALSE(table.take(4711));
  EXPECT_EQ(table.size(), 1U);
}

TEST(ReplyTableTest, GivesAllInTheOrderOfTheRequests) {
  ReplyTable table;
  std::vector<AnswerKind> kinds;
  for (const AnswerKind kind : {AnswerKind::kReporters, AnswerKind::kPlain, AnswerKind::kValidity})
    EXPECT_NE(table.add(entry(kind)), 0U);
  for (const ReplyTable::Entry& each : table.takeAll()) kinds.push_back(each.reply.kind);
  EXPECT_THAT(kinds, testing::ElementsAre(AnswerKind::kReporters, AnswerKind::kPlain, AnswerKind::kValidity));
  EXPECT_EQ(table.size(), 0U);
}

}  // namespace
}  // namespace tonewerk
