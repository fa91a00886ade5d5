// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineQueues.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class OfflineQueuesTest : public testing::Test {
 protected:
  Task note(const std::string& name) {
    return [this, name] { done_.push_back(name); };
  }

  OfflineQueues queues_;
  std::vector<std::string> done_;
};

TEST_F(OfflineQueuesTest, TheWorkQueueWaitsForTheReplay) {
  const auto work = queues_.makeSerialQueue("work", QueuePriority::kUserInteractive);
  work->async([&] {
    EXPECT_TRUE(work->isCurrent());
    work->async(note("later"));
    note("first")();
  });
  EXPECT_THAT(done_, IsEmpty());
  queues_.runAll();
  EXPECT_THAT(done_, ElementsAre("first", "later"));
  EXPECT_FALSE(work->isCurrent());
}

TEST_F(OfflineQueuesTest, ASinksQueueRunsAtOnceAndInOrder) {
  const auto sink = queues_.makeSerialQueue("sink", QueuePriority::kUtility);
  sink->async([&] {
    sink->async(note("second"));
    note("first")();
  });
  EXPECT_THAT(done_, ElementsAre("first", "second"));
}

TEST_F(OfflineQueuesTest, AQueueRunsWhatIsLeftWhenItEnds) {
  auto work = queues_.makeSerialQueue("work", QueuePriority::kUserInteractive);
  work->async(note("left"));
  work.reset();
  EXPECT_THAT(done_, ElementsAre("left"));
  queues_.runAll();
  EXPECT_THAT(done_, ElementsAre("left"));
}

}  // namespace
}  // namespace tonewerk
