// SPDX-License-Identifier: Apache-2.0
#include <atomic>
#include <gtest/gtest.h>
#include <memory>
#include <thread>
#include <vector>

#include "platform/linux/threads/ThreadQueueFactory.h"
#include "support/manual/ManualQueues.h"

namespace tonewerk {
namespace {

// Tests that every serial queue must pass, those of the daemon and those of the tests.
template <typename Factory>
class SerialQueueContract : public testing::Test {
 protected:
  std::unique_ptr<SerialQueue> makeQueue() {
    return factory_.makeSerialQueue("com.orvane.test", QueuePriority::kUserInteractive);
  }

  Factory factory_;
};

using Factories = testing::Types<ThreadQueueFactory, ManualQueues>;
TYPED_TEST_SUITE(SerialQueueContract, Factories);

TYPED_TEST(SerialQueueContract, RunsWorkInTheOrderInWhichItWasQueued) {
  const auto queue = this->makeQueue();
  std::vector<int> order;
  for (int number = 0; number < 1000; ++number) queue->async([&order, number] { order.push_back(number); });
  queue->drain();
  ASSERT_EQ(order.size(), 1000U);
  for (int number = 0; number < 1000; ++number) EXPECT_EQ(order[static_cast<std::size_t>(number)], number);
}

TYPED_TEST(SerialQueueContract, IsCurrentInItsOwnWorkOnly) {
  const auto queue = this->makeQueue();
  const auto other = this->makeQueue();
  bool isOwn = false;
  bool isOthers = true;
  queue->async([&] {
    isOwn = queue->isCurrent();
    isOthers = other->isCurrent();
  });
  queue->drain();
  EXPECT_TRUE(isOwn);
  EXPECT_FALSE(isOthers);
  EXPECT_FALSE(queue->isCurrent());
}

TYPED_TEST(SerialQueueContract, OwnsTheThreadOfItsWorkAndNoOther) {
  const auto queue = this->makeQueue();
  bool isOwn = false;
  queue->async([&] { isOwn = queue->ownsThisThread(); });
  queue->drain();
  EXPECT_TRUE(isOwn);
  bool isOthers = true;
  std::thread([&] { isOthers = queue->ownsThisThread(); }).join();
  EXPECT_FALSE(isOthers);
}

TYPED_TEST(SerialQueueContract, DestructionRunsWhatIsQueuedAndWhatThatQueues) {
  auto queue = this->makeQueue();
  int ran = 0;
  queue->async([&ran, held = queue.get()] {
    ++ran;
    held->async([&ran, held] {
      ++ran;
      held->async([&ran] { ++ran; });
    });
  });
  queue.reset();
  EXPECT_EQ(ran, 3);
}

TYPED_TEST(SerialQueueContract, DestroysWorkOnTheQueueBeforeTheNextPieceRuns) {
  const auto queue = this->makeQueue();
  bool wasDestroyedOnQueue = false;
  bool wasDestroyedFirst = false;
  const auto atDestruction = [&](const int* held) {
    wasDestroyedOnQueue = queue->isCurrent();
    delete held;
  };
  queue->async([held = std::unique_ptr<int, decltype(atDestruction)>(new int(1), atDestruction)] {});
  queue->async([&] { wasDestroyedFirst = wasDestroyedOnQueue; });
  queue->drain();
  EXPECT_TRUE(wasDestroyedFirst);
}

TYPED_TEST(SerialQueueContract, KeepsTheOrderOfEachThreadThatQueuesWork) {
  constexpr int kThreads = 4;
  constexpr int kEach = 500;
  const auto queue = this->makeQueue();
  std::vector<int> last(kThreads, -1);
  int outOfOrder = 0;
  {
    std::vector<std::jthread> threads;
    threads.reserve(kThreads);
    for (int thread = 0; thread < kThreads; ++thread) {
      threads.emplace_back([&, thread] {
        for (int number = 0; number < kEach; ++number) {
          queue->async([&, thread, number] {
            int& before = last[static_cast<std::size_t>(thread)];
            if (before != number - 1) ++outOfOrder;
            before = number;
          });
        }
      });
    }
  }
  queue->drain();
  EXPECT_EQ(outOfOrder, 0);
  EXPECT_EQ(last, std::vector<int>(kThreads, kEach - 1));
}

TYPED_TEST(SerialQueueContract, DrainingAnIdleQueueReturns) {
  const auto queue = this->makeQueue();
  queue->drain();
  queue->drain();
  EXPECT_EQ(queue->name(), "com.orvane.test");
}

}  // namespace
}  // namespace tonewerk
