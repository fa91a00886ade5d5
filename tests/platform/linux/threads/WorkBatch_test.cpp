// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/WorkBatch.h"

#include <gmock/gmock.h>
#include <memory>

#include "platform/linux/threads/ThreadQueue.h"

namespace tonewerk {
namespace {

// Counts how often a batch ended for it.
class Counter final : public WorkBatch::Ending {
 public:
  void endOfBatch() override { ++ends; }
  int ends = 0;
};

TEST(WorkBatchTest, PutsOffToItsEnd) {
  const auto counter = std::make_shared<Counter>();
  {
    WorkBatch batch;
    EXPECT_TRUE(WorkBatch::putOff(counter));
    batch.pieceHasRun();
    EXPECT_EQ(counter->ends, 0);
  }
  EXPECT_EQ(counter->ends, 1);
  EXPECT_EQ(counter.use_count(), 1);
}

TEST(WorkBatchTest, NothingIsPutOffOutsideOfABatch) {
  const auto counter = std::make_shared<Counter>();
  EXPECT_FALSE(WorkBatch::putOff(counter));
  EXPECT_EQ(counter.use_count(), 1);
}

TEST(WorkBatchTest, EndsAfterSoManyPieces) {
  const auto counter = std::make_shared<Counter>();
  WorkBatch batch;
  WorkBatch::putOff(counter);
  for (std::size_t piece = 1; piece < WorkBatch::kMostPieces; ++piece) batch.pieceHasRun();
  EXPECT_EQ(counter->ends, 0);
  batch.pieceHasRun();
  EXPECT_EQ(counter->ends, 1);
}

TEST(WorkBatchTest, AnEndingMayPutOffAnother) {
  class Chain final : public WorkBatch::Ending {
   public:
    explicit Chain(std::shared_ptr<Counter> next) : next_(std::move(next)) {}
    void endOfBatch() override { WorkBatch::putOff(next_); }

   private:
    std::shared_ptr<Counter> next_;
  };
  const auto counter = std::make_shared<Counter>();
  {
    const WorkBatch batch;
    WorkBatch::putOff(std::make_shared<Chain>(counter));
  }
  EXPECT_EQ(counter->ends, 1);
}

TEST(WorkBatchTest, AQueuesWorkRunsInBatches) {
  const auto counter = std::make_shared<Counter>();
  bool isPutOff = false;
  {
    ThreadQueue queue("test", QueuePriority::kUtility);
    queue.async([&] { isPutOff = WorkBatch::putOff(counter); });
  }
  EXPECT_TRUE(isPutOff);
  EXPECT_EQ(counter->ends, 1);
}

}  // namespace
}  // namespace tonewerk
