// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/BatchScope.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>

#include "platform/linux/threads/ThreadQueue.h"

namespace tonewerk {
namespace {

// Counts the calls of endOfBatch().
class Counter final : public BatchScope::Deferred {
 public:
  void endOfBatch() override { ++ends; }
  int ends = 0;
};

TEST(BatchScopeTest, RunsDeferredWorkAtItsEnd) {
  const auto counter = std::make_shared<Counter>();
  {
    BatchScope batch;
    EXPECT_TRUE(BatchScope::defer(counter));
    batch.pieceHasRun();
    EXPECT_EQ(counter->ends, 0);
  }
  EXPECT_EQ(counter->ends, 1);
  EXPECT_EQ(counter.use_count(), 1);
}

TEST(BatchScopeTest, NothingIsDeferredOutsideABatch) {
  const auto counter = std::make_shared<Counter>();
  EXPECT_FALSE(BatchScope::defer(counter));
  EXPECT_EQ(counter.use_count(), 1);
}

TEST(BatchScopeTest, WhatIsDeferredFirstRunsBeforeTheRest) {
  class Order final : public BatchScope::Deferred {
   public:
    Order(std::string& order, char name) : order_(order), name_(name) {}
    void endOfBatch() override { order_ += name_; }

   private:
    std::string& order_;
    const char name_;
  };
  std::string order;
  const auto first = std::make_shared<Order>(order, 'a');
  EXPECT_FALSE(BatchScope::deferFirst(first));
  {
    const BatchScope batch;
    EXPECT_TRUE(BatchScope::defer(std::make_shared<Order>(order, 'b')));
    EXPECT_TRUE(BatchScope::deferFirst(first));
    EXPECT_TRUE(BatchScope::deferFirst(first));
  }
  EXPECT_EQ(order, "ab");
}

TEST(BatchScopeTest, EndsAfterTheLargestNumberOfPieces) {
  const auto counter = std::make_shared<Counter>();
  BatchScope batch;
  EXPECT_TRUE(BatchScope::defer(counter));
  for (std::size_t piece = 1; piece < BatchScope::kMaxPieces; ++piece) batch.pieceHasRun();
  EXPECT_EQ(counter->ends, 0);
  batch.pieceHasRun();
  EXPECT_EQ(counter->ends, 1);
}

TEST(BatchScopeTest, DeferredWorkMayDeferMore) {
  class Chain final : public BatchScope::Deferred {
   public:
    explicit Chain(std::shared_ptr<Counter> next) : next_(std::move(next)) {}
    void endOfBatch() override { EXPECT_TRUE(BatchScope::defer(next_)); }

   private:
    std::shared_ptr<Counter> next_;
  };
  const auto counter = std::make_shared<Counter>();
  {
    const BatchScope batch;
    EXPECT_TRUE(BatchScope::defer(std::make_shared<Chain>(counter)));
  }
  EXPECT_EQ(counter->ends, 1);
}

TEST(BatchScopeTest, AQueuesWorkRunsInBatches) {
  const auto counter = std::make_shared<Counter>();
  bool isDeferred = false;
  {
    ThreadQueue queue("test", QueuePriority::kUtility);
    queue.async([&] { isDeferred = BatchScope::defer(counter); });
  }
  EXPECT_TRUE(isDeferred);
  EXPECT_EQ(counter->ends, 1);
}

}  // namespace
}  // namespace tonewerk
