// SPDX-License-Identifier: Apache-2.0
#include "session/StrandPool.h"

#include <gmock/gmock.h>
#include <optional>
#include <string>
#include <thread>

#include "support/manual/ManualSerialQueue.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMax = StrandPool::kMaxHeldBytes;

class StrandPoolTest : public ::testing::Test {
 protected:
  StrandPoolTest() {
    auto owned = std::make_unique<ManualSerialQueue>("thread");
    thread = owned.get();
    pool.emplace(std::move(owned), "linkReport", log);
    strand = pool->makeStrand();
  }

  void submit(Strand& to, const std::string& text, std::size_t bytes = 0) {
    to.submit(bytes, [this, text] { ran += text; });
  }
  void submitHolding(Strand& to) {
    to.submit(0, [&to] { to.hold(); });
  }

  MemoryLog lines;
  const LogCategory log{lines, "com.orvane.tonewerk", "twri"};
  std::string ran;
  ManualSerialQueue* thread = nullptr;
  std::optional<StrandPool> pool;
  std::shared_ptr<Strand> strand;
};

TEST_F(StrandPoolTest, RunsPiecesInTheOrderOfSubmission) {
  const auto other = pool->makeStrand();
  submit(*strand, "a");
  submit(*other, "b");
  submit(*strand, "c");
  EXPECT_EQ(ran, "");
  thread->runAll();
  EXPECT_EQ(ran, "abc");
}

TEST_F(StrandPoolTest, HoldsThePiecesBehindAHoldUntilReleased) {
  submit(*strand, "a");
  submitHolding(*strand);
  submit(*strand, "b");
  submit(*strand, "c");
  thread->runAll();
  EXPECT_EQ(ran, "a");
  EXPECT_EQ(pool->heldCount(), 2U);

  strand->interrupt([&] { strand->release(); });
  submit(*strand, "d");
  thread->runAll();
  EXPECT_EQ(ran, "abcd");
  EXPECT_EQ(pool->heldCount(), 0U);
}

TEST_F(StrandPoolTest, AHeldStrandDoesNotDelayOthers) {
  const auto other = pool->makeStrand();
  submitHolding(*strand);
  submit(*strand, "a");
  submit(*other, "b");
  thread->runAll();
  EXPECT_EQ(ran, "b");
}

TEST_F(StrandPoolTest, AReleasedPieceMayHoldAgain) {
  submitHolding(*strand);
  submit(*strand, "a");
  submitHolding(*strand);
  submit(*strand, "b");
  thread->runAll();
  for (const char* expected : {"a", "ab"}) {
    strand->interrupt([&] { strand->release(); });
    thread->runAll();
    EXPECT_EQ(ran, expected);
  }
}

TEST_F(StrandPoolTest, AnInterruptFromInsideAPieceRunsAtOnce) {
  strand->submit(0, [&] {
    strand->interrupt([&] { ran += "inner"; });
    ran += "outer";
  });
  thread->runAll();
  EXPECT_EQ(ran, "innerouter");
}

TEST_F(StrandPoolTest, RunsAtOnceWhenNoPieceWaits) {
  std::thread::id runner;
  EXPECT_TRUE(strand->runAtOnce([&] {
    runner = std::this_thread::get_id();
    EXPECT_TRUE(strand->ownsThisThread());
  }));
  EXPECT_EQ(runner, std::this_thread::get_id());
  EXPECT_FALSE(strand->ownsThisThread());
  submit(*strand, "a");
  thread->runAll();
  EXPECT_TRUE(strand->runAtOnce([&] { ran += "b"; }));
  EXPECT_EQ(ran, "ab");
}

TEST_F(StrandPoolTest, DoesNotRunAtOnceBeforePiecesThatWait) {
  submit(*strand, "a");
  EXPECT_FALSE(strand->runAtOnce([&] { ran += "b"; }));
  EXPECT_EQ(ran, "");
}

TEST_F(StrandPoolTest, DoesNotRunAtOnceBeforePiecesThatAreHeld) {
  submitHolding(*strand);
  submit(*strand, "a");
  thread->runAll();
  EXPECT_FALSE(strand->runAtOnce([&] { ran += "b"; }));
  strand->interrupt([&] { strand->release(); });
  thread->runAll();
  EXPECT_TRUE(strand->runAtOnce([&] { ran += "c"; }));
  EXPECT_EQ(ran, "ac");
}

TEST_F(StrandPoolTest, DoesNotRunAtOnceWhileHeldWithoutAnyPiece) {
  submitHolding(*strand);
  thread->runAll();
  EXPECT_FALSE(strand->runAtOnce([&] { ran += "a"; }));
  strand->interrupt([&] { strand->release(); });
  thread->runAll();
  EXPECT_TRUE(strand->runAtOnce([&] { ran += "b"; }));
  EXPECT_EQ(ran, "b");
}

TEST_F(StrandPoolTest, DoesNotRunAtOnceWhileAPieceRuns) {
  EXPECT_TRUE(strand->runAtOnce([&] { EXPECT_FALSE(strand->runAtOnce([&] { ran += "inner"; })); }));
  EXPECT_EQ(ran, "");
}

TEST_F(StrandPoolTest, RunsAtOnceAgainAfterADroppedPiece) {
  submitHolding(*strand);
  submit(*strand, "a", kMax + 1);
  thread->runAll();
  strand->interrupt([&] { strand->release(); });
  thread->runAll();
  EXPECT_TRUE(strand->runAtOnce([&] { ran += "b"; }));
  EXPECT_EQ(ran, "b");
}

TEST_F(StrandPoolTest, AnInterruptFromWorkThatRunsAtOnceRunsBeforeItReturns) {
  EXPECT_TRUE(strand->runAtOnce([&] {
    strand->interrupt([&] { ran += "inner"; });
    ran += "outer";
  }));
  EXPECT_EQ(ran, "innerouter");
}

TEST_F(StrandPoolTest, DropsAndCountsPiecesThatDoNotFitWhileHeld) {
  submitHolding(*strand);
  submit(*strand, "a", kMax / 2);
  submit(*strand, "b", kMax / 2);
  submit(*strand, "c", 1);
  thread->runAll();
  EXPECT_EQ(pool->droppedCount(), 1U);
  EXPECT_EQ(pool->heldCount(), 2U);

  strand->interrupt([&] {
    EXPECT_EQ(strand->takeDroppedCount(), 1U);
    strand->release();
  });
  thread->runAll();
  EXPECT_EQ(ran, "ac");
}

TEST_F(StrandPoolTest, TheRoomIsSharedAndIsFreedWhenAStrandEnds) {
  auto other = pool->makeStrand();
  submitHolding(*other);
  submit(*other, "x", kMax - 1024);
  submitHolding(*strand);
  submit(*strand, "a", 1024);
  thread->runAll();
  EXPECT_EQ(pool->droppedCount(), 1U);

  other.reset();
  EXPECT_EQ(pool->heldCount(), 0U);
  submit(*strand, "b", 1024);
  thread->runAll();
  EXPECT_EQ(pool->droppedCount(), 1U);
  EXPECT_EQ(pool->heldCount(), 1U);
}

TEST_F(StrandPoolTest, EmptyPiecesTakeRoomToo) {
  submitHolding(*strand);
  for (std::size_t n = 0; n < kMax / 64; ++n) submit(*strand, "");
  thread->runAll();
  EXPECT_GT(pool->droppedCount(), 0U);
}

TEST_F(StrandPoolTest, TheDestructorRunsQueuedPiecesAndDropsHeldOnes) {
  const auto other = pool->makeStrand();
  const auto kept = std::make_shared<int>(0);
  submitHolding(*strand);
  strand->submit(0, [kept, self = strand] {});  // refers to its own strand, as a worker's pieces do
  submit(*other, "b");
  pool.reset();
  EXPECT_EQ(ran, "b");
  EXPECT_EQ(kept.use_count(), 1);
  strand->interrupt([&] { ran += "late"; });
  EXPECT_EQ(ran, "b");
}

}  // namespace
}  // namespace tonewerk
