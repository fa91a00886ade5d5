// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueue.h"

#include <future>
#include <gmock/gmock.h>
#include <vector>

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using testing::IsEmpty;
using testing::SizeIs;

constexpr milliseconds kLongEnough{30'000};

AnalyticsRow row(int n) { return {0.0, "a", {{"n", n}}}; }

StoreQueue::Limits small() {
  StoreQueue::Limits limits;
  limits.rows = 2;
  limits.gather = milliseconds(0);
  limits.hold = kLongEnough;
  return limits;
}

class StoreQueueTest : public testing::Test {
 protected:
  StoreQueue queue_{small()};
  std::vector<StoreRow> batch_;
};

TEST_F(StoreQueueTest, AddWaitsUntilThereIsRoom) {
  EXPECT_FALSE(queue_.add(row(0)));
  EXPECT_FALSE(queue_.add(row(1)));
  auto third = std::async(std::launch::async, [&] { return queue_.add(row(2)); });
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_THAT(batch_, SizeIs(2));
  queue_.committed();
  EXPECT_FALSE(third.get());
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_THAT(batch_, SizeIs(1));
  EXPECT_EQ(queue_.takeDropped(), 0U);
  queue_.committed();
}

TEST_F(StoreQueueTest, CountsRowsUntilTheyAreCommitted) {
  EXPECT_FALSE(queue_.add(row(0)));
  EXPECT_FALSE(queue_.add(row(1)));
  ASSERT_TRUE(queue_.take(batch_, true));
  queue_.failed();
  EXPECT_FALSE(queue_.add(row(2)));
  EXPECT_EQ(queue_.lost(), 3U);
  EXPECT_EQ(queue_.takeDropped(), 1U);
  queue_.committed();
  EXPECT_FALSE(queue_.add(row(3)));
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_THAT(batch_, SizeIs(1));
}

TEST_F(StoreQueueTest, AddStopsWaitingWhenWritingFails) {
  EXPECT_FALSE(queue_.add(row(0)));
  EXPECT_FALSE(queue_.add(row(1)));
  auto third = std::async(std::launch::async, [&] { return queue_.add(row(2)); });
  ASSERT_TRUE(queue_.take(batch_, true));
  queue_.failed();
  EXPECT_FALSE(third.get());
  EXPECT_EQ(queue_.takeDropped(), 1U);
  queue_.committed();
}

TEST_F(StoreQueueTest, TakesARowThatIsLargerThanItsBoundAlone) {
  StoreQueue::Limits limits = small();
  limits.bytes = 10;
  StoreQueue queue(limits);
  EXPECT_FALSE(queue.add(row(0)));
  ASSERT_TRUE(queue.take(batch_, true));
  EXPECT_THAT(batch_, SizeIs(1));
}

TEST_F(StoreQueueTest, AddWaitsNoLongerThanTheHoldTimeAndReportsThatOnce) {
  StoreQueue::Limits limits = small();
  limits.hold = milliseconds(1);
  StoreQueue queue(limits);
  EXPECT_FALSE(queue.add(row(0)));
  EXPECT_FALSE(queue.add(row(1)));
  EXPECT_TRUE(queue.add(row(2)));
  EXPECT_FALSE(queue.add(row(3)));
  ASSERT_TRUE(queue.take(batch_, true));
  EXPECT_EQ(queue.takeDropped(), 2U);
  queue.committed();
}

TEST_F(StoreQueueTest, FlushEndsWithTheCommit) {
  EXPECT_FALSE(queue_.add(row(0)));
  auto flushed = std::async(std::launch::async, [&] { return queue_.flush(kLongEnough); });
  ASSERT_TRUE(queue_.take(batch_, true));
  queue_.beginAttempt();
  queue_.committed();
  EXPECT_TRUE(flushed.get());
}

TEST_F(StoreQueueTest, FlushIsTriedOnceMoreBeforeItFails) {
  EXPECT_FALSE(queue_.add(row(0)));
  ASSERT_TRUE(queue_.take(batch_, true));
  queue_.beginAttempt();
  queue_.failed();
  auto flushed = std::async(std::launch::async, [&] { return queue_.flush(kLongEnough); });
  EXPECT_TRUE(queue_.pause(kLongEnough));  // the flush ended it
  queue_.beginAttempt();
  queue_.failed();
  EXPECT_FALSE(flushed.get());
}

TEST_F(StoreQueueTest, FlushGivesUpAfterItsTime) {
  EXPECT_FALSE(queue_.add(row(0)));
  EXPECT_FALSE(queue_.flush(milliseconds(1)));
}

TEST_F(StoreQueueTest, FlushOfAnEmptyQueueSucceeds) { EXPECT_TRUE(queue_.flush(kLongEnough)); }

TEST_F(StoreQueueTest, ReturnsTheRemainingRowsBeforeItStops) {
  EXPECT_FALSE(queue_.add(row(0)));
  queue_.stop();
  EXPECT_TRUE(queue_.take(batch_, true));
  EXPECT_THAT(batch_, SizeIs(1));
  queue_.committed();
  EXPECT_FALSE(queue_.take(batch_, true));
  EXPECT_THAT(batch_, IsEmpty());
  EXPECT_FALSE(queue_.pause(kLongEnough));
}

TEST_F(StoreQueueTest, ANudgedWriterReturnsWithoutRows) {
  queue_.wakeWriter();
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_THAT(batch_, IsEmpty());
  queue_.committed();

  auto writer = std::async(std::launch::async, [this] { return queue_.take(batch_, true); });
  queue_.wakeWriter();
  EXPECT_TRUE(writer.get());
  EXPECT_THAT(batch_, IsEmpty());
}

}  // namespace
}  // namespace tonewerk
