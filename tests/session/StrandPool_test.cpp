// SPDX-License-Identifier: Apache-2.0
#include "session/StrandPool.h"

#include <gmock/gmock.h>
#include <optional>
#include <string>

#include "support/manual/ManualSerialQueue.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMax = StrandPool::kMaxHeldBytes;

class StrandPoolTest : public ::testing::Test {
 protected:
  StrandPoolTest() {
    auto owned = std::make_unique<ManualSerialQueue>("thread");
    thread = owned.get();
    queues.emplace(std::move(owned));
    queue = queues->makeQueue();
  }

  void submit(Strand& to, const std::string& text, std::size_t bytes = 0) {
    to.submit(bytes, [this, text] { ran += text; });
  }
  void submitHolding(Strand& to) {
    to.submit(0, [&to] { to.hold(); });
  }

  std::string ran;
  ManualSerialQueue* thread = nullptr;
  std::optional<StrandPool> queues;
  std::shared_ptr<Strand> queue;
};

TEST_F(StrandPoolTest, RunsPiecesInTheOrderOfSubmission) {
  const auto other = queues->makeQueue();
  submit(*queue, "a");
  submit(*other, "b");
  submit(*queue, "c");
  EXPECT_EQ(ran, "");
  thread->runAll();
  EXPECT_EQ(ran, "abc");
}

TEST_F(StrandPoolTest, HoldsThePiecesBehindTheOneThatWaitsUntilReleased) {
  submit(*queue, "a");
  submitHolding(*queue);
  submit(*queue, "b");
  submit(*queue, "c");
  thread->runAll();
  EXPECT_EQ(ran, "a");
  EXPECT_EQ(queues->heldCount(), 2U);

  queue->interrupt([&] { queue->release(); });
  submit(*queue, "d");
  thread->runAll();
  EXPECT_EQ(ran, "abcd");
  EXPECT_EQ(queues->heldCount(), 0U);
}

TEST_F(StrandPoolTest, AHeldQueueHoldsUpNoOther) {
  const auto other = queues->makeQueue();
  submitHolding(*queue);
  submit(*queue, "a");
  submit(*other, "b");
  thread->runAll();
  EXPECT_EQ(ran, "b");
}

TEST_F(StrandPoolTest, AReleasedPieceMayHoldAgain) {
  submitHolding(*queue);
  submit(*queue, "a");
  submitHolding(*queue);
  submit(*queue, "b");
  thread->runAll();
  for (const char* expected : {"a", "ab"}) {
    queue->interrupt([&] { queue->release(); });
    thread->runAll();
    EXPECT_EQ(ran, expected);
  }
}

TEST_F(StrandPoolTest, AnInterruptFromInsideAPieceRunsAtOnce) {
  queue->submit(0, [&] {
    queue->interrupt([&] { ran += "inner"; });
    ran += "outer";
  });
  thread->runAll();
  EXPECT_EQ(ran, "innerouter");
}

TEST_F(StrandPoolTest, DropsAndCountsWhatFindsNoRoomWhileHeld) {
  submitHolding(*queue);
  submit(*queue, "a", kMax / 2);
  submit(*queue, "b", kMax / 2);
  submit(*queue, "c", 1);
  thread->runAll();
  EXPECT_EQ(queues->droppedCount(), 1U);
  EXPECT_EQ(queues->heldCount(), 2U);

  queue->interrupt([&] {
    EXPECT_EQ(queue->takeDroppedCount(), 1U);
    queue->release();
  });
  thread->runAll();
  EXPECT_EQ(ran, "ac");
}

TEST_F(StrandPoolTest, TheRoomIsSharedAndComesBackWhenAQueueDies) {
  auto other = queues->makeQueue();
  submitHolding(*other);
  submit(*other, "x", kMax - 1024);
  submitHolding(*queue);
  submit(*queue, "a", 1024);
  thread->runAll();
  EXPECT_EQ(queues->droppedCount(), 1U);

  other.reset();
  EXPECT_EQ(queues->heldCount(), 0U);
  submit(*queue, "b", 1024);
  thread->runAll();
  EXPECT_EQ(queues->droppedCount(), 1U);
  EXPECT_EQ(queues->heldCount(), 1U);
}

TEST_F(StrandPoolTest, EmptyPiecesTakeRoomToo) {
  submitHolding(*queue);
  for (std::size_t n = 0; n < kMax / 64; ++n) submit(*queue, "");
  thread->runAll();
  EXPECT_GT(queues->droppedCount(), 0U);
}

TEST_F(StrandPoolTest, AtTheEndRunsWhatIsQueuedAndDropsWhatIsHeld) {
  const auto other = queues->makeQueue();
  const auto kept = std::make_shared<int>(0);
  submitHolding(*queue);
  queue->submit(0, [kept, self = queue] {});  // refers to its own queue, as a worker's pieces do
  submit(*other, "b");
  queues.reset();
  EXPECT_EQ(ran, "b");
  EXPECT_EQ(kept.use_count(), 1);
  queue->interrupt([&] { ran += "late"; });
  EXPECT_EQ(ran, "b");
}

}  // namespace
}  // namespace tonewerk
