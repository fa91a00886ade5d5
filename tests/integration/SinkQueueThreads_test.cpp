// SPDX-License-Identifier: Apache-2.0
//
// Tests the queue of a sink whose thread is slow or hangs.
#include <chrono>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <thread>

#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/linux/threads/ThreadQueue.h"
#include "session/SinkQueue.h"
#include "support/memory/MemoryLog.h"

using namespace std::chrono_literals;

namespace tonewerk {
namespace {

constexpr std::size_t kMax = 1000;

class SinkQueueThreadsTest : public ::testing::Test {
 protected:
  MemoryLog lines;
  const LogCategory log{lines, "com.orvane.tonewerk", "twru"};
  std::optional<SinkQueue> sink;
};

// A large file on a slow disk: its piece beats as it writes, and that is progress.
TEST_F(SinkQueueThreadsTest, WaitsLongerThanTheHoldTimeForAPieceThatBeats) {
  sink.emplace(std::make_unique<ThreadQueue>("sink", QueuePriority::kUtility), "files", log,
               SinkQueue::Limits{.waitingBytes = kMax, .hold = 200ms, .longestWait = 1h});
  std::promise<void> begins;
  EXPECT_TRUE(sink->submit(kMax, [&begins] {
    begins.set_value();
    const auto end = std::chrono::steady_clock::now() + 600ms;
    while (std::chrono::steady_clock::now() < end) {
      Heartbeat::beatHere();
      std::this_thread::yield();
    }
  }));
  begins.get_future().wait();
  EXPECT_TRUE(sink->submit(1, [] {}));
}

TEST_F(SinkQueueThreadsTest, DoesNotWaitForASlowSinkForEver) {
  sink.emplace(std::make_unique<ThreadQueue>("sink", QueuePriority::kUtility), "files", log,
               SinkQueue::Limits{.waitingBytes = kMax, .hold = 1h, .longestWait = 1ms});
  std::promise<void> goesOn;
  EXPECT_TRUE(sink->submit(kMax, [&goesOn] { goesOn.get_future().wait(); }));
  EXPECT_FALSE(sink->submit(1, [] {}));
  goesOn.set_value();
  sink.reset();  // the piece uses the promise
}

TEST_F(SinkQueueThreadsTest, DrainsOnlyForAWhile) {
  sink.emplace(std::make_unique<ThreadQueue>("sink", QueuePriority::kUtility), "files", log);
  std::promise<void> goesOn;
  EXPECT_TRUE(sink->submit(1, [&goesOn] { goesOn.get_future().wait(); }));
  EXPECT_FALSE(sink->drain(1ms));
  goesOn.set_value();
  EXPECT_TRUE(sink->drain(1h));
}

}  // namespace
}  // namespace tonewerk
