// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueue.h"

#include <future>
#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "support/PackedMaps.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using testing::ElementsAre;

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
  StoreBatch batch_;
};

TEST_F(StoreQueueTest, AddWaitsUntilThereIsRoom) {
  EXPECT_FALSE(queue_.add(row(0)));
  EXPECT_FALSE(queue_.add(row(1)));
  auto third = std::async(std::launch::async, [&] { return queue_.add(row(2)); });
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 2U);
  queue_.committed();
  EXPECT_FALSE(third.get());
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 1U);
  EXPECT_EQ(queue_.takeDropped(), 0U);
  queue_.committed();
}

// A payload that is held takes memory of its client, for hours when the disk is full.
TEST_F(StoreQueueTest, HoldsNoPayloadOfABatchThatGetsNoMoreRows) {
  ShapeTable shapes;
  const ValueMap first = packedMapOf({{"n", 1}}, shapes);
  const ValueMap second = packedMapOf({{"n", 2}}, shapes);
  const ValueMap third = packedMapOf({{"n", 3}}, shapes);
  StoreQueue::Limits limits = small();
  limits.rows = 3;
  limits.batchRows = 2;
  StoreQueue queue(limits);
  EXPECT_FALSE(queue.add(AnalyticsRow{0.0, "a", first}));
  EXPECT_TRUE(first.packed()->isShared());
  EXPECT_FALSE(queue.add(AnalyticsRow{0.0, "a", second}));
  EXPECT_FALSE(first.packed()->isShared());
  EXPECT_TRUE(second.packed()->isShared());
  EXPECT_FALSE(queue.add(AnalyticsRow{0.0, "a", third}));  // begins another batch
  EXPECT_FALSE(second.packed()->isShared());
  EXPECT_TRUE(third.packed()->isShared());
  for (int batch = 0; batch < 2; ++batch) {
    ASSERT_TRUE(queue.take(batch_, true));
    queue.committed();
  }
  EXPECT_EQ(batch_.rows(), 1U);
  EXPECT_FALSE(third.packed()->isShared());
}

TEST_F(StoreQueueTest, AMessageThatSharesTheRowOfItsEventTakesNoRoom) {
  const auto session = std::make_shared<RtcSessionRecord>();
  for (int n = 0; n < 2; ++n) {
    const AnalyticsRow event = row(n);
    EXPECT_FALSE(queue_.add(event));
    EXPECT_FALSE(queue_.add(RtcMessageRow{0.0, session, 4, 1, event.payload}));
  }
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 2U);
  EXPECT_TRUE(batch_.rtcMessages().empty());
  queue_.committed();
  EXPECT_TRUE(queue_.flush(milliseconds(0)));  // both rows are committed, and no others are waited for
}

TEST_F(StoreQueueTest, AMessageHasARowOfItsOwnWhenTheWriterHasTakenItsEvent) {
  const auto session = std::make_shared<RtcSessionRecord>();
  const AnalyticsRow event = row(0);
  EXPECT_FALSE(queue_.add(event));
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_FALSE(batch_.analytics().front().rtc);
  EXPECT_FALSE(queue_.add(RtcMessageRow{0.0, session, 4, 1, event.payload}));
  queue_.committed();
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_TRUE(batch_.analytics().empty());
  EXPECT_EQ(batch_.rtcMessages().size(), 1U);
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
  EXPECT_EQ(batch_.rows(), 1U);
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
  EXPECT_EQ(batch_.rows(), 1U);
}

TEST_F(StoreQueueTest, MoreThanABatchOfRowsIsTakenInBatchesInTheOrderOfRecording) {
  StoreQueue::Limits limits;
  limits.batchRows = 3;
  StoreQueue queue(limits);
  std::vector<std::string> taken;
  std::vector<std::size_t> sizes;
  int added = 0;
  // The batches come back to the queue and are used again.
  for (int round = 0; round < 4; ++round) {
    for (int n = 0; n < 8; ++n) EXPECT_FALSE(queue.add(row(added++)));
    while (queue.take(batch_, false) && !batch_.empty()) {
      sizes.push_back(batch_.rows());
      for (const StoreBatch::Analytics& event : batch_.analytics()) {
        taken.emplace_back(batch_.text(event.payload));
      }
      queue.committed();
    }
  }
  EXPECT_THAT(sizes, ElementsAre(3, 3, 2, 3, 3, 2, 3, 3, 2, 3, 3, 2));
  std::vector<std::string> expected;
  expected.reserve(taken.size());
  for (int n = 0; n < added; ++n) expected.push_back("{\"n\":" + std::to_string(n) + "}");
  EXPECT_EQ(taken, expected);
}

TEST_F(StoreQueueTest, ABatchEndsWithTheRowThatReachesItsBytes) {
  StoreQueue::Limits limits;
  limits.batchBytes = 2000;
  StoreQueue queue(limits);
  for (int n = 0; n < 4; ++n)
    EXPECT_FALSE(queue.add(AnalyticsRow{0.0, "a", {{"t", std::string(1500, 'x')}}}));
  EXPECT_FALSE(queue.add(AnalyticsRow{0.0, "a", {{"t", std::string(9000, 'x')}}}));
  std::vector<std::size_t> sizes;
  while (queue.take(batch_, false) && !batch_.empty()) {
    sizes.push_back(batch_.rows());
    queue.committed();
  }
  EXPECT_THAT(sizes, ElementsAre(2, 2, 1));
}

TEST_F(StoreQueueTest, CountsBytesUntilTheyAreCommitted) {
  StoreQueue::Limits limits = small();
  limits.rows = 100;
  const AnalyticsRow kilobyte{0.0, "a", {{"t", std::string(1000, 'x')}}};
  limits.bytes = 2 * StoreBatch::bytesOf(kilobyte, StoreRowText(kilobyte));
  StoreQueue queue(limits);
  queue.failed();  // nothing waits
  EXPECT_FALSE(queue.add(kilobyte));
  ASSERT_TRUE(queue.take(batch_, true));
  EXPECT_FALSE(queue.add(kilobyte));
  EXPECT_EQ(queue.takeDropped(), 0U);  // two fit exactly
  EXPECT_FALSE(queue.add(kilobyte));
  EXPECT_EQ(queue.takeDropped(), 1U);
  queue.committed();
  EXPECT_FALSE(queue.add(kilobyte));
  EXPECT_EQ(queue.takeDropped(), 0U);
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
  EXPECT_EQ(batch_.rows(), 1U);
  queue_.committed();
  EXPECT_FALSE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 0U);
  EXPECT_FALSE(queue_.pause(kLongEnough));
}

TEST_F(StoreQueueTest, ANudgedWriterReturnsWithoutRows) {
  queue_.wakeWriter();
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 0U);
  queue_.committed();

  auto writer = std::async(std::launch::async, [this] { return queue_.take(batch_, true); });
  queue_.wakeWriter();
  EXPECT_TRUE(writer.get());
  EXPECT_EQ(batch_.rows(), 0U);
}

}  // namespace
}  // namespace tonewerk
