// SPDX-License-Identifier: Apache-2.0
#include "session/WorkQueueGate.h"

#include <gtest/gtest.h>
#include <memory>
#include <thread>

#include "support/ManualSerialQueue.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

TEST(WorkQueueGateTest, WorkOfAnotherThreadWaitsForTheQueue) {
  ManualSerialQueue queue("work");
  WorkQueueGate gate(queue);
  bool isDone = false;
  bool wasTaken = false;
  std::thread([&] { wasTaken = gate.run([&] { isDone = true; }); }).join();
  EXPECT_TRUE(wasTaken);
  EXPECT_FALSE(isDone);
  queue.runAll();
  EXPECT_TRUE(isDone);
}

TEST(WorkQueueGateTest, TheQueuesOwnWorkIsServedAtOnceAlsoFromWithin) {
  ManualSerialQueue queue("work");
  WorkQueueGate gate(queue);
  int depth = 0;
  queue.async([&] {
    gate.run([&] { gate.run([&] { depth = 2; }); });
    EXPECT_EQ(depth, 2);
  });
  queue.runAll();
  EXPECT_EQ(depth, 2);
}

TEST(WorkQueueGateTest, NothingComesThroughOnceItIsClosed) {
  ManualSerialQueue queue("work");
  WorkQueueGate gate(queue);
  gate.close();
  bool isDone = false;
  EXPECT_FALSE(gate.run([&] { isDone = true; }));
  EXPECT_EQ(queue.runAll(), 0U);
  EXPECT_FALSE(isDone);
}

class ContextGateTest : public ReportingTest {};

TEST_F(ContextGateTest, TheContextsGateLeadsToTheWorkQueueAndClosesWithTheContext) {
  const std::shared_ptr<WorkQueueGate> gate = context->reportingServerQueueGate();
  bool wasOnTheQueue = false;
  gate->run([&] { wasOnTheQueue = context->reportingServerQueue().isCurrent(); });
  test.queues.runAll();
  EXPECT_TRUE(wasOnTheQueue);

  context.reset();
  EXPECT_FALSE(gate->run([] {}));
}

}  // namespace
}  // namespace tonewerk
