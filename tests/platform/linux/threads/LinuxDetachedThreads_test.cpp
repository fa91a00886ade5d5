// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/LinuxDetachedThreads.h"

#include <future>
#include <gtest/gtest.h>
#include <pthread.h>
#include <string>
#include <sys/resource.h>
#include <thread>
#include <unistd.h>

namespace tonewerk {
namespace {

struct ObservedThread {
  std::thread::id thread;
  std::string name;
  int niceness = 0;
};

TEST(LinuxDetachedThreads, RunsWorkOnItsOwnNamedThreadWithLowPriority) {
  LinuxDetachedThreads threads;
  std::promise<ObservedThread> promise;
  auto seen = promise.get_future();
  ASSERT_FALSE(threads.start("twr-some-work", [promise = std::move(promise)]() mutable {
    char name[16] = {};
    pthread_getname_np(pthread_self(), name, sizeof(name));
    promise.set_value(
        {std::this_thread::get_id(), name, getpriority(PRIO_PROCESS, static_cast<id_t>(gettid()))});
  }));
  const ObservedThread found = seen.get();
  EXPECT_NE(found.thread, std::this_thread::get_id());
  EXPECT_EQ(found.name, "twr-some-work");
  EXPECT_GE(found.niceness, 5);
}

}  // namespace
}  // namespace tonewerk
