// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadQueue.h"

#include <array>
#include <future>
#include <gtest/gtest.h>
#include <pthread.h>
#include <string>

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

}  // namespace
}  // namespace tonewerk
