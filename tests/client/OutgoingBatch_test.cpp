// SPDX-License-Identifier: Apache-2.0
#include "client/OutgoingBatch.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

class OutgoingBatchTest : public testing::Test {
 protected:
  void add(const std::string& frame, std::uint32_t identifier,
           OutgoingFrame::Origin origin = OutgoingFrame::Origin::kQueue) {
    OutgoingFrame added;
    added.bodyAt = batch.bytes().size() + 2;
    added.bodyBytes = frame.size() < 2 ? 0 : frame.size() - 2;
    batch.bytes() += frame;
    added.identifier = identifier;
    added.origin = origin;
    batch.add(std::move(added));
  }
  static std::vector<std::uint32_t> identifiers(const std::vector<OutgoingFrame>& frames) {
    std::vector<std::uint32_t> all;
    for (const OutgoingFrame& frame : frames) all.push_back(frame.identifier);
    return all;
  }

  OutgoingBatch batch;
};

TEST_F(OutgoingBatchTest, CountsAFrameAsGoneWithItsLastByte) {
  add("abc", 1);
  add("def", 2);
  EXPECT_THAT(identifiers(batch.sent(2)), testing::IsEmpty());
  EXPECT_THAT(identifiers(batch.sent(1)), testing::ElementsAre(1));
  EXPECT_EQ(batch.unsent(), "def");
  EXPECT_THAT(identifiers(batch.sent(2)), testing::IsEmpty());
  EXPECT_THAT(identifiers(batch.takeBack()), testing::ElementsAre(2));
  EXPECT_TRUE(batch.empty());
  EXPECT_EQ(batch.unsent(), "");
}

TEST_F(OutgoingBatchTest, SendsAFrameWithoutBytesAfterThoseBeforeIt) {
  add("abc", 1);
  add("", 2);
  EXPECT_THAT(identifiers(batch.sent(0)), testing::IsEmpty());
  EXPECT_THAT(identifiers(batch.sent(3)), testing::ElementsAre(1, 2));
  add("", 3);
  EXPECT_THAT(identifiers(batch.sent(0)), testing::ElementsAre(3));
}

TEST_F(OutgoingBatchTest, GivesARingsMessageBackWithItsBody) {
  add("##one", 1, OutgoingFrame::Origin::kRing);
  add("##two", 2, OutgoingFrame::Origin::kRing);
  EXPECT_EQ(batch.sent(6).size(), 1U);
  const std::vector<OutgoingFrame> back = batch.takeBack();
  ASSERT_EQ(back.size(), 1U);
  EXPECT_EQ(back[0].command.body, "two");
}

TEST_F(OutgoingBatchTest, KeepsTheMemoryOfSmallFramesButNotOfALargeOne) {
  add(std::string(1000, 'x'), 1);
  EXPECT_EQ(batch.sent(1000).size(), 1U);
  EXPECT_GE(batch.bytes().capacity(), 1000U);
  const std::string large(3 * OutgoingBatch::kFullBytes, 'x');
  add(large, 2);
  EXPECT_EQ(batch.sent(large.size()).size(), 1U);
  EXPECT_LT(batch.bytes().capacity(), 100U);
  add(large, 3);
  EXPECT_EQ(batch.takeBack().size(), 1U);
  EXPECT_LT(batch.bytes().capacity(), 100U);
}

TEST_F(OutgoingBatchTest, IsFullAtItsBound) {
  add(std::string(OutgoingBatch::kFullBytes - 1, 'x'), 1);
  EXPECT_FALSE(batch.isFull());
  add("x", 2);
  EXPECT_TRUE(batch.isFull());
  EXPECT_EQ(batch.sent(OutgoingBatch::kFullBytes).size(), 2U);
  EXPECT_FALSE(batch.isFull());
}

}  // namespace
}  // namespace tonewerk
