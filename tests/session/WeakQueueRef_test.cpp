// SPDX-License-Identifier: Apache-2.0
#include "session/WeakQueueRef.h"

#include <atomic>
#include <gtest/gtest.h>
#include <memory>
#include <thread>

#include "support/ReportingTest.h"
#include "support/manual/ManualSerialQueue.h"

namespace tonewerk {
namespace {

TEST(WeakQueueRefTest, WorkOfAnotherThreadWaitsForTheQueue) {
  ManualSerialQueue queue("work");
  WeakQueueRef ref(queue);
  bool isDone = false;
  bool wasTaken = false;
  std::thread([&] { wasTaken = ref.run([&] { isDone = true; }); }).join();
  EXPECT_TRUE(wasTaken);
  EXPECT_FALSE(isDone);
  queue.runAll();
  EXPECT_TRUE(isDone);
}

TEST(WeakQueueRefTest, RunsAtOnceFromTheQueuesOwnWorkAlsoNested) {
  ManualSerialQueue queue("work");
  WeakQueueRef ref(queue);
  int depth = 0;
  queue.async([&] {
    EXPECT_TRUE(ref.run([&] { EXPECT_TRUE(ref.run([&] { depth = 2; })); }));
    EXPECT_EQ(depth, 2);
  });
  queue.runAll();
  EXPECT_EQ(depth, 2);
}

TEST(WeakQueueRefTest, RunsNothingOnceItIsClosed) {
  ManualSerialQueue queue("work");
  WeakQueueRef ref(queue);
  ref.close();
  bool isDone = false;
  EXPECT_FALSE(ref.run([&] { isDone = true; }));
  EXPECT_EQ(queue.runAll(), 0U);
  EXPECT_FALSE(isDone);
}

TEST(WeakQueueRefTest, WhileTheQueueEndsRunsAcceptedWorkAndNoRefusedWork) {
  for (int round = 0; round < 20; ++round) {
    auto queue = std::make_unique<ManualSerialQueue>("work");
    WeakQueueRef ref(*queue);
    std::atomic<int> taken = 0;
    std::atomic<int> ran = 0;
    const auto answer = [&] {
      for (int n = 0; n < 200; ++n) {
        if (ref.run([&ran] { ++ran; })) ++taken;
      }
    };
    std::thread one(answer);
    std::thread other(answer);
    ref.close();
    queue.reset();
    one.join();
    other.join();
    EXPECT_EQ(taken, ran);
    EXPECT_FALSE(ref.run([] {}));
  }
}

class ContextQueueRefTest : public ReportingTest {};

TEST_F(ContextQueueRefTest, TheContextsReferenceReachesTheWorkQueueAndClosesWithTheContext) {
  const std::shared_ptr<WeakQueueRef> ref = context->reportingServerQueueRef();
  bool wasOnTheQueue = false;
  EXPECT_TRUE(ref->run([&] { wasOnTheQueue = context->reportingServerQueue().isCurrent(); }));
  test.queues.runAll();
  EXPECT_TRUE(wasOnTheQueue);

  context.reset();
  EXPECT_FALSE(ref->run([] {}));
}

}  // namespace
}  // namespace tonewerk
