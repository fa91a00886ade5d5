// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreQueue.h"

#include <atomic>
#include <future>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "support/PackedMaps.h"
#include "support/manual/ManualClock.h"

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

TEST_F(StoreQueueTest, WhoMustNotWaitLosesWhatHasNoRoomAndOthersGoOnWaiting) {
  queue_.addIfRoom(row(0));
  queue_.addIfRoom(row(1));
  queue_.addIfRoom(row(2));
  auto fourth = std::async(std::launch::async, [&] { return queue_.add(row(3)); });
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 2U);
  queue_.committed();
  EXPECT_FALSE(fourth.get());
  EXPECT_EQ(queue_.takeDropped(), 1U);
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_EQ(batch_.rows(), 1U);
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

// Two users record into a queue of 8 rows or 8,000 bytes: a small row counts as 1,000 bytes.
class ChargedQueueTest : public testing::Test {
 protected:
  ChargedQueueTest() { accounts_.totals().setTotal(kSink, eightRows().bytes); }

  static StoreQueue::Limits eightRows() {
    StoreQueue::Limits limits = small();
    limits.rows = 8;
    limits.bytes = 8000;
    return limits;
  }
  // Records rows for a user. Returns whether one of them has waited for the whole hold time.
  bool add(const std::shared_ptr<Account>& account, int rows, std::size_t bytes = 0) {
    const WorkingFor scope(account);
    bool hasTimedOut = false;
    for (int n = 0; n < rows; ++n) {
      hasTimedOut |= queue_.add(AnalyticsRow{0.0, "a", {{"t", std::string(bytes, 'x')}}});
    }
    return hasTimedOut;
  }
  void takeAndCommit() {
    ASSERT_TRUE(queue_.take(batch_, false));
    queue_.committed();
  }

  static constexpr Resource kSink = Resource::kSinkBytes;

  ManualClock clock_;
  Accounts accounts_{990, clock_};
  const std::shared_ptr<Account> first_ = accounts_.of(1001);
  const std::shared_ptr<Account> second_ = accounts_.of(1002);
  StoreQueue queue_{eightRows()};
  StoreBatch batch_;
};

TEST_F(ChargedQueueTest, ARowIsChargedToItsUserUntilItIsCommitted) {
  add(first_, 2);
  add(second_, 1);
  EXPECT_EQ(first_->held(kSink), 2000U);
  EXPECT_EQ(second_->held(kSink), 1000U);
  ASSERT_TRUE(queue_.take(batch_, true));
  add(first_, 1);
  EXPECT_EQ(first_->held(kSink), 3000U);
  queue_.committed();
  EXPECT_EQ(first_->held(kSink), 1000U);
  EXPECT_EQ(second_->held(kSink), 0U);
}

TEST_F(ChargedQueueTest, ALargeRowIsChargedWithItsBytes) {
  add(first_, 1, 2500);
  EXPECT_EQ(first_->held(kSink),
            sizeof(StoreBatch::Analytics) + 2500 + std::string_view(R"({"t":""})").size());
}

TEST_F(ChargedQueueTest, NobodyIsChargedForARowOfTheDaemonNorForAMessageThatSharesARow) {
  EXPECT_FALSE(queue_.add(row(1)));
  const WorkingFor scope(first_);
  const AnalyticsRow event = row(2);
  EXPECT_FALSE(queue_.add(event));
  EXPECT_FALSE(queue_.add(RtcMessageRow{0.0, std::make_shared<RtcSessionRecord>(), 4, 1, event.payload}));
  EXPECT_EQ(accounts_.totals().held(kSink), 1000U);
}

TEST_F(ChargedQueueTest, AUserWhoHasFilledHalfHasNoRoomUntilTheCommit) {
  add(first_, 4);
  EXPECT_FALSE(first_->hasRoom(kSink));
  EXPECT_TRUE(second_->hasRoom(kSink));
  bool isWoken = false;
  first_->whenRoom(kSink, [&] {
    isWoken = true;
    EXPECT_EQ(queue_.takeDropped(), 0U);  // the queue's lock is free
  });
  ASSERT_TRUE(queue_.take(batch_, true));
  EXPECT_FALSE(isWoken);
  queue_.committed();
  EXPECT_TRUE(isWoken);
}

TEST_F(ChargedQueueTest, AFailureGivesBackAllChargesAndNoneIsTakenUntilTheNextCommit) {
  add(first_, 1);
  ASSERT_TRUE(queue_.take(batch_, true));
  add(first_, 1);
  add(second_, 1);
  bool isWoken = false;
  add(first_, 2);
  first_->whenRoom(kSink, [&] { isWoken = true; });
  EXPECT_FALSE(isWoken);
  queue_.failed();
  EXPECT_TRUE(isWoken);
  EXPECT_EQ(accounts_.totals().held(kSink), 0U);
  add(second_, 1);
  queue_.failed();
  EXPECT_EQ(accounts_.totals().held(kSink), 0U);

  queue_.committed();  // now the rows behind the batch that is written are charged again
  EXPECT_EQ(first_->held(kSink), 3000U);
  EXPECT_EQ(second_->held(kSink), 2000U);
  takeAndCommit();
  EXPECT_EQ(accounts_.totals().held(kSink), 0U);
  add(second_, 1);
  EXPECT_EQ(second_->held(kSink), 1000U);
}

TEST_F(ChargedQueueTest, ARowThatWaitedForTheWholeHoldTimeGivesBackAllCharges) {
  StoreQueue::Limits limits = eightRows();
  limits.hold = milliseconds(1);
  StoreQueue queue(limits);
  const WorkingFor scope(first_);
  for (int n = 0; n < 8; ++n) EXPECT_FALSE(queue.add(row(n)));
  ASSERT_TRUE(queue.take(batch_, false));
  EXPECT_EQ(first_->held(kSink), 8000U);
  bool isWoken = false;
  first_->whenRoom(kSink, [&] { isWoken = true; });
  EXPECT_TRUE(queue.add(row(8)));
  EXPECT_TRUE(isWoken);
  EXPECT_EQ(first_->held(kSink), 0U);
  EXPECT_EQ(first_->refused(kSink), 1U);
  queue.committed();
  EXPECT_EQ(first_->held(kSink), 0U);
}

TEST_F(ChargedQueueTest, WhileRowsAreDroppedOneUserFillsHalfAndLeavesRoomForOthers) {
  queue_.failed();
  add(first_, 6);
  EXPECT_EQ(queue_.takeDropped(), 2U);
  EXPECT_EQ(first_->refused(kSink), 2U);
  add(second_, 3);
  EXPECT_EQ(queue_.takeDropped(), 0U);
  EXPECT_EQ(queue_.lost(), 7U);
  EXPECT_EQ(accounts_.totals().held(kSink), 0U);
}

TEST_F(ChargedQueueTest, WhileRowsAreDroppedTheDaemonsOwnFillTheWholeQueue) {
  queue_.failed();
  for (int n = 0; n < 10; ++n) EXPECT_FALSE(queue_.add(row(n)));
  EXPECT_EQ(queue_.takeDropped(), 2U);
}

TEST_F(ChargedQueueTest, WhileRowsAreDroppedTheRowsThatAreBeingWrittenCountAsTheUsers) {
  add(first_, 3);
  ASSERT_TRUE(queue_.take(batch_, true));
  queue_.failed();
  add(first_, 3);
  EXPECT_EQ(queue_.takeDropped(), 2U);
}

TEST_F(ChargedQueueTest, WhileRowsAreDroppedTheFirstRowOfAUserMayBeLargerThanHalf) {
  queue_.failed();
  add(first_, 2);
  add(second_, 1, 5000);
  EXPECT_EQ(queue_.takeDropped(), 0U);
  add(second_, 1);
  EXPECT_EQ(queue_.takeDropped(), 1U);
}

TEST_F(ChargedQueueTest, TheEndOfTheQueueGivesBackWhatNobodyWrote) {
  {
    StoreQueue queue(eightRows());
    const WorkingFor scope(first_);
    EXPECT_FALSE(queue.add(row(1)));
    EXPECT_EQ(first_->held(kSink), 1000U);
  }
  EXPECT_EQ(first_->held(kSink), 0U);
}

TEST_F(ChargedQueueTest, ManyThreadsLeaveNothingChargedWhenWritingFailsNowAndThen) {
  std::vector<std::future<bool>> recorders;
  recorders.reserve(4);
  for (int recorder = 0; recorder < 4; ++recorder) {
    recorders.push_back(std::async(
        std::launch::async, [this, recorder] { return add(recorder % 2 == 0 ? first_ : second_, 500); }));
  }
  std::atomic<bool> hasEnded = false;
  auto writer = std::async(std::launch::async, [&] {
    for (int batch = 0; !hasEnded || !batch_.empty(); ++batch) {
      if (!queue_.take(batch_, false)) return false;
      if (batch % 3 == 0) queue_.failed();
      queue_.committed();
    }
    return true;
  });
  for (auto& recorder : recorders) EXPECT_FALSE(recorder.get());
  hasEnded = true;
  EXPECT_TRUE(writer.get());
  takeAndCommit();
  EXPECT_EQ(queue_.lost() - queue_.takeDropped(), 0U);
  EXPECT_EQ(accounts_.totals().held(kSink), 0U);
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
