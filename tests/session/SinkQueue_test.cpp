// SPDX-License-Identifier: Apache-2.0
#include "session/SinkQueue.h"

#include <atomic>
#include <chrono>
#include <gmock/gmock.h>
#include <string>
#include <thread>
#include <vector>

#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "support/manual/ManualSerialQueue.h"
#include "support/memory/MemoryLog.h"

using namespace std::chrono_literals;

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::size_t kMax = 1000;

class SinkQueueTest : public ::testing::Test {
 protected:
  SinkQueueTest() {
    auto owned = std::make_unique<ManualSerialQueue>("sink");
    queue = owned.get();
    sink = std::make_unique<SinkQueue>(std::move(owned), "files", log, limits);
  }

  // Gives the sink another hold time.
  void makeSinkHolding(std::chrono::milliseconds hold, std::chrono::milliseconds longestWait) {
    sink.reset();
    limits.hold = hold;
    limits.longestWait = longestWait;
    auto owned = std::make_unique<ManualSerialQueue>("sink");
    queue = owned.get();
    sink = std::make_unique<SinkQueue>(std::move(owned), "files", log, limits);
  }

  std::vector<std::string> errors() const { return lines.textsOf("twru", LogLevel::kError); }

  // Submits on a new thread, which sets `taken` when submit() has taken the piece.
  std::thread submitElsewhere(std::size_t bytes, std::atomic<bool>& taken) {
    return std::thread([this, bytes, &taken] { taken = sink->submit(bytes, [] {}); });
  }

  MemoryLog lines;
  const LogCategory log{lines, "com.orvane.tonewerk", "twru"};
  SinkQueue::Limits limits{.waitingBytes = kMax, .hold = 1h, .longestWait = 1h};
  ManualSerialQueue* queue = nullptr;
  std::unique_ptr<SinkQueue> sink;
};

TEST_F(SinkQueueTest, RunsWorkInOrder) {
  std::string ran;
  EXPECT_TRUE(sink->submit(1, [&] { ran += "a"; }));
  EXPECT_TRUE(sink->submit(1, [&] { ran += "b"; }));
  sink->drain();
  EXPECT_EQ(ran, "ab");
}

TEST_F(SinkQueueTest, TakesWorkUpToItsBoundWithoutWaiting) {
  EXPECT_TRUE(sink->submit(kMax - 1, [] {}));
  EXPECT_TRUE(sink->submit(1, [] {}));
  EXPECT_EQ(queue->pendingCount(), 2U);
}

TEST_F(SinkQueueTest, MakesTheSubmitterWaitPastItsBound) {
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  std::atomic<bool> taken = false;
  std::thread submitter = submitElsewhere(1, taken);
  EXPECT_EQ(queue->pendingCount(), 1U);
  while (!taken) queue->runAll();  // the end of the first piece makes room
  submitter.join();
  queue->runAll();
}

TEST_F(SinkQueueTest, TakesAPieceLargerThanItsBoundWhenItIsEmpty) {
  EXPECT_TRUE(sink->submit(kMax + 1, [] {}));
  EXPECT_EQ(queue->pendingCount(), 1U);
}

TEST_F(SinkQueueTest, TheDestructorRunsQueuedWork) {
  bool ran = false;
  EXPECT_TRUE(sink->submit(1, [&] { ran = true; }));
  sink.reset();
  EXPECT_TRUE(ran);
}

// Once, submit() waited as long as the disk did.
TEST_F(SinkQueueTest, DropsWhatDoesNotFitIntoTheQueueOfASinkThatHangs) {
  makeSinkHolding(1ms, 1h);
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  EXPECT_FALSE(sink->submit(1, [] { FAIL(); }));
  EXPECT_EQ(sink->status().dropped, 1U);
  EXPECT_THAT(errors(), ElementsAre(testing::HasSubstr("files hangs; what does not fit is dropped")));
  queue->runAll();
}

TEST_F(SinkQueueTest, WaitsOnlyOnceForASinkThatHangs) {
  makeSinkHolding(50ms, 1h);
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  EXPECT_FALSE(sink->submit(1, [] {}));
  const auto before = std::chrono::steady_clock::now();
  for (int piece = 0; piece < 100; ++piece) EXPECT_FALSE(sink->submit(1, [] {}));
  EXPECT_LT(std::chrono::steady_clock::now() - before, 100 * 50ms);
  EXPECT_EQ(sink->status().dropped, 101U);
  EXPECT_THAT(errors(), testing::SizeIs(1));
}

TEST_F(SinkQueueTest, TakesWorkAgainWhenTheSinkGoesOnAndSaysWhatWasDropped) {
  makeSinkHolding(1ms, 1h);
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  EXPECT_FALSE(sink->submit(1, [] {}));
  EXPECT_FALSE(sink->submit(1, [] {}));
  queue->runAll();
  EXPECT_THAT(errors().back(), testing::HasSubstr("files makes progress again; dropped meanwhile: 2"));
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  EXPECT_EQ(sink->status().waiting, 1U);
  EXPECT_EQ(sink->status().dropped, 2U);
}

// The queued pieces run at the end. Something waits whenever something is dropped, so the end of a piece says
// it.
TEST_F(SinkQueueTest, SaysAtItsEndWhatItDropped) {
  makeSinkHolding(1ms, 1ms);
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  EXPECT_FALSE(sink->submit(1, [] {}));
  EXPECT_FALSE(sink->submit(1, [] {}));
  ASSERT_THAT(errors(), testing::SizeIs(1));
  sink.reset();
  ASSERT_THAT(errors(), testing::SizeIs(2));
  EXPECT_THAT(errors().back(), testing::HasSubstr("files makes progress again; dropped meanwhile: 2"));
}

// Once, whoever asked for the status took the sink's beats from those who waited for it, and they dropped.
TEST_F(SinkQueueTest, DropsNothingOfASinkThatMovesWhileItsStatusIsAskedFor) {
  makeSinkHolding(200ms, 1h);
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread beating(heartbeat);
  EXPECT_TRUE(sink->submit(1, [] {}));
  queue->runAll();  // the sink knows its thread's heartbeat now
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  std::atomic<bool> taken = false;
  std::thread submitter = submitElsewhere(1, taken);
  const auto end = std::chrono::steady_clock::now() + 600ms;
  while (std::chrono::steady_clock::now() < end) {
    heartbeat->beat();
    EXPECT_EQ(sink->status().hangs, 0s);
    std::this_thread::yield();
  }
  queue->runAll();
  submitter.join();
  EXPECT_TRUE(taken);
  EXPECT_EQ(sink->status().dropped, 0U);
  queue->runAll();
}

// A disk may hang from the start, in the work that is posted then.
TEST_F(SinkQueueTest, ShowsThatItHangsInPostedWork) {
  makeSinkHolding(0ms, 1h);
  sink->post([] {});
  EXPECT_GT(sink->status().hangs, 0s);
  EXPECT_EQ(sink->status().waiting, 0U);  // no report waits
  queue->runAll();
  EXPECT_EQ(sink->status().hangs, 0s);
}

TEST_F(SinkQueueTest, TheEndOfPostedWorkIsProgress) {
  makeSinkHolding(1ms, 1h);
  sink->post([] {});
  EXPECT_TRUE(sink->submit(kMax, [] {}));
  EXPECT_FALSE(sink->submit(1, [] {}));
  queue->runAll();
  EXPECT_TRUE(sink->submit(1, [] {}));
}

TEST_F(SinkQueueTest, ShowsSinceWhenTheSinkHangs) {
  makeSinkHolding(0ms, 1h);
  EXPECT_EQ(sink->status().hangs, 0s);
  EXPECT_TRUE(sink->submit(1, [] {}));
  EXPECT_GT(sink->status().hangs, 0s);
  queue->runAll();
  EXPECT_EQ(sink->status().hangs, 0s);
}

TEST_F(SinkQueueTest, CountsPiecesThatCouldNotWrite) {
  EXPECT_TRUE(sink->submit(1, [this] { sink->countLost(); }));
  queue->runAll();
  EXPECT_EQ(sink->status().dropped, 1U);
  EXPECT_THAT(errors(), IsEmpty());  // whoever could not write has logged why
}

}  // namespace
}  // namespace tonewerk
