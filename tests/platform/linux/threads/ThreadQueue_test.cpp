// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadQueue.h"

#include <array>
#include <cstdint>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <pthread.h>
#include <string>
#include <thread>

#include "platform/Heartbeat.h"

namespace tonewerk {
namespace {

TEST(ThreadQueueTest, RunsWorkWithoutDrain) {
  ThreadQueue queue("work", QueuePriority::kUtility);
  std::promise<void> first;
  queue.async([&] { first.set_value(); });
  first.get_future().wait();
  // The thread waits for work or is about to wait. In both cases it must notice the next piece of work.
  std::promise<void> second;
  queue.async([&] { second.set_value(); });
  second.get_future().wait();
  EXPECT_FALSE(queue.isCurrent());
}

TEST(ThreadQueueTest, NamesItsThreadByTheEndOfItsName) {
  ThreadQueue queue("com.orvane.audio.session-work", QueuePriority::kUserInteractive);
  std::array<char, 16> name{};
  queue.async([&] { pthread_getname_np(pthread_self(), name.data(), name.size()); });
  queue.drain();
  EXPECT_STREQ(name.data(), "io.session-work");
}

TEST(ThreadQueueTest, SurvivesABurst) {
  ThreadQueue queue("work", QueuePriority::kUtility);
  int ran = 0;
  for (int number = 0; number < 20'000; ++number) queue.async([&ran] { ++ran; });
  queue.drain();
  EXPECT_EQ(ran, 20'000);
}

// The queue's own thread is about to wait some time after it was made or has run work.
template <typename Work>
void runAtOnceWhenItWaits(ThreadQueue& queue, const Work& work) {
  while (!queue.runAtOnce(work)) std::this_thread::yield();
}

TEST(ThreadQueueTest, RunsWorkAtOnceOnTheCallingThreadWhileItWaits) {
  ThreadQueue queue("work", QueuePriority::kUtility);
  std::thread::id thread;
  bool wasCurrent = false;
  runAtOnceWhenItWaits(queue, [&] {
    thread = std::this_thread::get_id();
    wasCurrent = queue.isCurrent();
  });
  EXPECT_EQ(thread, std::this_thread::get_id());
  EXPECT_TRUE(wasCurrent);
  EXPECT_FALSE(queue.isCurrent());
}

TEST(ThreadQueueTest, RunsNothingAtOnceWhileWorkRunsOrIsQueued) {
  ThreadQueue queue("work", QueuePriority::kUtility);
  std::promise<void> begun;
  std::promise<void> end;
  queue.async([&] {
    begun.set_value();
    end.get_future().wait();
  });
  int ran = 0;
  EXPECT_FALSE(queue.runAtOnce([&] { ++ran; }));  // queued or running
  begun.get_future().wait();
  EXPECT_FALSE(queue.runAtOnce([&] { ++ran; }));  // running
  end.set_value();
  queue.drain();
  EXPECT_EQ(ran, 0);
}

TEST(ThreadQueueTest, RunsNothingAtOnceWhileAnotherThreadDoes) {
  ThreadQueue queue("work", QueuePriority::kUtility);
  bool didRun = true;
  runAtOnceWhenItWaits(queue, [&] { std::thread([&] { didRun = queue.runAtOnce([] {}); }).join(); });
  EXPECT_FALSE(didRun);
}

TEST(ThreadQueueTest, WorkThatIsQueuedMeanwhileRunsAfterwardsOnTheOwnThread) {
  ThreadQueue queue("work", QueuePriority::kUtility);
  bool hasEnded = false;
  bool ranAfterwards = false;
  std::thread::id thread;
  runAtOnceWhenItWaits(queue, [&] {
    queue.async([&] {
      ranAfterwards = hasEnded;
      thread = std::this_thread::get_id();
    });
    hasEnded = true;
  });
  queue.drain();
  EXPECT_TRUE(ranAfterwards);
  EXPECT_NE(thread, std::this_thread::get_id());
}

// Many times, because the end does not always begin before the work's own end.
TEST(ThreadQueueTest, EndsAfterTheWorkThatAnotherThreadRunsAtOnce) {
  for (int round = 0; round < 200; ++round) {
    auto queue = std::make_unique<ThreadQueue>("work", QueuePriority::kUtility);
    std::thread end;
    bool hasEnded = false;
    runAtOnceWhenItWaits(*queue, [&] {
      std::promise<void> begun;
      end = std::thread([&] {
        begun.set_value();
        queue = nullptr;
        EXPECT_TRUE(hasEnded);
      });
      begun.get_future().wait();
      for (int pause = 0; pause < round; ++pause) std::this_thread::yield();
      hasEnded = true;
    });
    end.join();
  }
}

TEST(ThreadQueueTest, NeverRunsTwoPiecesAtATimeWhoeverRunsThem) {
  constexpr int kPieces = 20'000;
  ThreadQueue queue("work", QueuePriority::kUtility);
  int ran = 0;  // without a lock: the queue is one
  std::thread other([&] {
    for (int number = 0; number < kPieces; ++number) queue.async([&ran] { ++ran; });
  });
  for (int number = 0; number < kPieces; ++number) {
    if (!queue.runAtOnce([&ran] { ++ran; })) queue.async([&ran] { ++ran; });
  }
  other.join();
  queue.drain();
  EXPECT_EQ(ran, 2 * kPieces);
}

class ThreadQueueHeartbeatTest : public testing::Test {
 protected:
  // Waits until the queue's thread rests.
  void waitForRest() {
    while (heartbeat->read().isWorking) std::this_thread::yield();
  }

  ThreadQueue queue{"work", QueuePriority::kUtility};
  std::shared_ptr<const Heartbeat> heartbeat = [this] {
    std::shared_ptr<const Heartbeat> found;
    queue.async([&] { found = Heartbeat::ofThisThread(); });
    queue.drain();
    return found;
  }();
};

TEST_F(ThreadQueueHeartbeatTest, BeatsAfterEachPieceOfWork) {
  ASSERT_NE(heartbeat, nullptr);
  std::array<std::uint64_t, 3> beats{};
  for (std::uint64_t& count : beats) queue.async([&] { count = heartbeat->read().beats; });
  queue.drain();
  EXPECT_LT(beats[0], beats[1]);
  EXPECT_LT(beats[1], beats[2]);
}

TEST_F(ThreadQueueHeartbeatTest, StandsStillInAPieceThatHangsAndRestsAfterTheLast) {
  std::promise<void> begun;
  std::promise<void> end;
  queue.async([&] {
    begun.set_value();
    end.get_future().wait();
  });
  begun.get_future().wait();
  const Heartbeat::Reading before = heartbeat->read();
  EXPECT_TRUE(before.isWorking);
  queue.async([] {});  // more work is no progress
  EXPECT_EQ(heartbeat->read().beats, before.beats);
  end.set_value();
  queue.drain();
  waitForRest();
  EXPECT_GT(heartbeat->read().beats, before.beats);
}

// A thread that never wakes up would otherwise look like one that has nothing to do.
TEST_F(ThreadQueueHeartbeatTest, WorksFromTheMomentThatWorkIsQueued) {
  for (int round = 0; round < 1'000; ++round) {
    waitForRest();
    const std::uint64_t before = heartbeat->read().beats;
    queue.async([] {});
    EXPECT_TRUE(heartbeat->read().isWorking || heartbeat->read().beats > before);
    queue.drain();
  }
}

TEST_F(ThreadQueueHeartbeatTest, RestsWhileAnotherThreadRunsTheWork) {
  runAtOnceWhenItWaits(queue, [&] { EXPECT_FALSE(heartbeat->read().isWorking); });
  waitForRest();
}

}  // namespace
}  // namespace tonewerk
