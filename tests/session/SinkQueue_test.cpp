// SPDX-License-Identifier: Apache-2.0
#include "session/SinkQueue.h"

#include <atomic>
#include <gtest/gtest.h>
#include <string>
#include <thread>

#include "support/manual/ManualSerialQueue.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMax = SinkQueue::kMaxWaitingBytes;

class SinkQueueTest : public ::testing::Test {
 protected:
  SinkQueueTest() {
    auto owned = std::make_unique<ManualSerialQueue>("sink");
    queue = owned.get();
    sink = std::make_unique<SinkQueue>(std::move(owned));
  }

  // Submits on a new thread, which sets `taken` when submit() has returned.
  std::thread submitElsewhere(std::size_t bytes, std::atomic<bool>& taken) {
    return std::thread([this, bytes, &taken] {
      sink->submit(bytes, [] {});
      taken = true;
    });
  }

  ManualSerialQueue* queue = nullptr;
  std::unique_ptr<SinkQueue> sink;
};

TEST_F(SinkQueueTest, RunsWorkInOrder) {
  std::string ran;
  sink->submit(1, [&] { ran += "a"; });
  sink->submit(1, [&] { ran += "b"; });
  sink->drain();
  EXPECT_EQ(ran, "ab");
}

TEST_F(SinkQueueTest, TakesWorkUpToItsBoundWithoutWaiting) {
  sink->submit(kMax - 1, [] {});
  sink->submit(1, [] {});
  EXPECT_EQ(queue->pendingCount(), 2U);
}

TEST_F(SinkQueueTest, MakesTheSubmitterWaitPastItsBound) {
  sink->submit(kMax, [] {});
  std::atomic<bool> taken = false;
  std::thread submitter = submitElsewhere(1, taken);
  EXPECT_EQ(queue->pendingCount(), 1U);
  while (!taken) queue->runAll();  // the end of the first piece makes room
  submitter.join();
  queue->runAll();
}

TEST_F(SinkQueueTest, TakesAPieceLargerThanItsBoundWhenItIsEmpty) {
  sink->submit(kMax + 1, [] {});
  EXPECT_EQ(queue->pendingCount(), 1U);
}

TEST_F(SinkQueueTest, TheDestructorRunsQueuedWork) {
  bool ran = false;
  sink->submit(1, [&] { ran = true; });
  sink.reset();
  EXPECT_TRUE(ran);
}

}  // namespace
}  // namespace tonewerk
