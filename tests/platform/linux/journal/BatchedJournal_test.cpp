// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/BatchedJournal.h"

#include <gtest/gtest.h>
#include <memory>

#include "support/memory/MemoryJournal.h"

namespace tonewerk {
namespace {

using Operation = MemoryJournal::Operation;

class BatchedJournalTest : public testing::Test {
 protected:
  // Answers at the end of a batch, as a connection does.
  class Answer final : public BatchScope::Deferred {
   public:
    explicit Answer(const MemoryJournal& journal) : journal_(journal) {}
    void endOfBatch() override { writesBefore = journal_.uses(Operation::kWrite); }
    std::size_t writesBefore = 0;

   private:
    const MemoryJournal& journal_;
  };

  MemoryJournal memory;
  BatchedJournal journal{memory};
};

TEST_F(BatchedJournalTest, ABatchIsWrittenOnce) {
  {
    const BatchScope batch;
    journal.append(Journal::Kind::kRequest, {}, "a");
    journal.append(Journal::Kind::kRequest, {}, "b");
    EXPECT_EQ(memory.uses(Operation::kWrite), 0U);
  }
  EXPECT_EQ(memory.uses(Operation::kWrite), 1U);
}

TEST_F(BatchedJournalTest, ItIsWrittenBeforeAnswersThatWereDeferredEarlier) {
  const auto answer = std::make_shared<Answer>(memory);
  {
    const BatchScope batch;
    ASSERT_TRUE(BatchScope::defer(answer));
    journal.append(Journal::Kind::kRequest, {}, "a");
  }
  EXPECT_EQ(answer->writesBefore, 1U);
}

TEST_F(BatchedJournalTest, OutsideOfABatchItIsWrittenAtOnce) {
  journal.append(Journal::Kind::kRequest, {}, "a");
  EXPECT_EQ(memory.uses(Operation::kWrite), 1U);
}

TEST_F(BatchedJournalTest, ARequestWithoutAFrameIsWrittenAtOnce) {
  const BatchScope batch;
  journal.append({}, "createReportingSession", {Value(77)});
  EXPECT_EQ(memory.uses(Operation::kWrite), 1U);
}

}  // namespace
}  // namespace tonewerk
