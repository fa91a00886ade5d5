// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpOutbox.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using std::chrono::seconds;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using Added = OtlpOutbox::Added;
using Urgency = OtlpOutbox::Urgency;

class OtlpOutboxTest : public testing::Test {
 protected:
  Added add(const std::string& record, Urgency urgency = Urgency::kBatched) {
    return outbox_.add(record, urgency, now_);
  }
  std::vector<std::string> take() { return outbox_.take(now_).records; }

  OtlpOutbox outbox_{{}};
  OtlpOutbox::Time now_ = seconds(100);
};

TEST_F(OtlpOutboxTest, ANewOutboxIsEmpty) {
  EXPECT_EQ(outbox_.nextDue(), std::nullopt);
  EXPECT_THAT(take(), IsEmpty());
  EXPECT_FALSE(outbox_.flush());
}

TEST_F(OtlpOutboxTest, BatchedRecordsWaitFiveSeconds) {
  EXPECT_EQ(add("a"), Added::kChangedDue);
  now_ += seconds(4);
  EXPECT_EQ(add("b"), Added::kKept);
  EXPECT_EQ(outbox_.nextDue(), seconds(105));
  EXPECT_THAT(take(), IsEmpty());
  now_ += seconds(1);
  EXPECT_THAT(take(), ElementsAre("a", "b"));
}

TEST_F(OtlpOutboxTest, FiveHundredAndTwelveAreDueAtOnce) {
  for (int n = 0; n < 511; ++n) add("x");
  EXPECT_THAT(take(), IsEmpty());
  EXPECT_EQ(add("x"), Added::kChangedDue);
  EXPECT_LE(*outbox_.nextDue(), now_);
  add("left");
  EXPECT_THAT(take(), SizeIs(512));
  EXPECT_THAT(take(), IsEmpty());
}

TEST_F(OtlpOutboxTest, AFlushMakesWaitingRecordsDueAndNotLaterOnes) {
  for (int n = 0; n < 600; ++n) add("x");
  EXPECT_TRUE(outbox_.flush());
  EXPECT_THAT(take(), SizeIs(512));
  add("later");
  // The rest of the flushed records is taken together with later ones.
  EXPECT_THAT(take(), SizeIs(89));
  add("afterwards");
  EXPECT_THAT(take(), IsEmpty());
}

TEST_F(OtlpOutboxTest, RealTimeRecordsAreDueAtOnceAndDoNotChangeTheBatch) {
  add("batched");
  EXPECT_EQ(add("now", Urgency::kAtOnce), Added::kChangedDue);
  EXPECT_LE(*outbox_.nextDue(), now_);
  EXPECT_THAT(take(), ElementsAre("now"));
  EXPECT_EQ(outbox_.nextDue(), seconds(105));
}

TEST_F(OtlpOutboxTest, ABatchHasALimitOfBytes) {
  const std::string megabyte(std::size_t{1} << 20, 'x');
  for (int n = 0; n < 6; ++n) add(megabyte, Urgency::kAtOnce);
  EXPECT_THAT(take(), SizeIs(3));
  EXPECT_THAT(take(), SizeIs(3));
}

TEST_F(OtlpOutboxTest, KeepsEightMegabytesUntilTheyAreSettled) {
  const std::string megabyte((std::size_t{1} << 20) - 64, 'x');
  for (int n = 0; n < 8; ++n) EXPECT_NE(add(megabyte), Added::kDropped);
  EXPECT_EQ(add(""), Added::kDropped);
  EXPECT_EQ(outbox_.count(), 8U);

  EXPECT_TRUE(outbox_.flush());
  const OtlpOutbox::Batch batch = outbox_.take(now_);
  EXPECT_EQ(add("taken is not gone"), Added::kDropped);
  outbox_.settle(batch, OtlpOutbox::Time(0));
  EXPECT_NE(add(megabyte), Added::kDropped);
  EXPECT_EQ(outbox_.count(), 9U - batch.records.size());
  EXPECT_EQ(outbox_.takeDropped(), 2U);
  EXPECT_EQ(outbox_.takeDropped(), 0U);
}

TEST_F(OtlpOutboxTest, ARecordLargerThanTheOutboxIsDropped) {
  EXPECT_EQ(add(std::string(std::size_t{9} << 20, 'x')), Added::kDropped);
}

}  // namespace
}  // namespace tonewerk
