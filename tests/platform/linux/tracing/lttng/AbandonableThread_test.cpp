// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/AbandonableThread.h"

#include <atomic>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <vector>

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

TEST(AbandonableThreadTest, RunsAllTasksInOrderBeforeItEnds) {
  std::vector<int> ran;
  {
    const AbandonableThread thread(1h);
    for (int i = 0; i < 100; ++i) thread.queue()->post([&ran, i] { ran.push_back(i); });
  }
  ASSERT_EQ(ran.size(), 100U);
  for (int i = 0; i < 100; ++i) EXPECT_EQ(ran[static_cast<std::size_t>(i)], i);
}

TEST(AbandonableThreadTest, TasksMayPostMore) {
  bool ran = false;
  {
    const AbandonableThread thread(1h);
    thread.queue()->post([&] { thread.queue()->post([&] { ran = true; }); });
  }
  EXPECT_TRUE(ran);
}

TEST(AbandonableThreadTest, SaysHowLongItHasBeenBusy) {
  const AbandonableThread thread(1h);
  EXPECT_EQ(thread.queue()->busyFor(), 0ms);
  std::promise<void> begun;
  std::promise<void> proceed;
  thread.queue()->post([&] {
    begun.set_value();
    proceed.get_future().wait();
  });
  begun.get_future().wait();
  while (thread.queue()->busyFor() == 0ms) std::this_thread::yield();
  proceed.set_value();
  while (thread.queue()->busyFor() != 0ms) std::this_thread::yield();
}

// A session daemon that hangs has this effect at the daemon's end.
TEST(AbandonableThreadTest, AbandonsATaskThatDoesNotReturn) {
  const auto proceed = std::make_shared<std::promise<void>>();
  const auto ended = std::make_shared<std::promise<void>>();
  {
    const AbandonableThread thread(1ms);
    thread.queue()->post([proceed, ended] {
      proceed->get_future().wait();
      ended->set_value();
    });
  }
  proceed->set_value();
  ended->get_future().wait();
}

TEST(AbandonableThreadTest, AcceptsNoTasksAfterItHasEnded) {
  std::shared_ptr<AbandonableThread::Queue> queue;
  {
    const AbandonableThread thread(1h);
    queue = thread.queue();
  }
  const auto held = std::make_shared<int>(0);
  queue->post([held] { ADD_FAILURE(); });
  EXPECT_EQ(held.use_count(), 1);
}

}  // namespace
}  // namespace tonewerk
