// SPDX-License-Identifier: Apache-2.0
#include "session/KeptMessages.h"

#include <cstddef>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "session/MessageRange.h"
#include "support/PackedMaps.h"
#include "support/ReportingTest.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class KeptMessagesTest : public ReportingTest {
 protected:
  ValueMap payload(double time, int number) {
    return packedMapOf({{"twreporting_timestamp", time}, {"n", number}}, shapes);
  }
  static std::vector<std::string> descriptionsOf(MessageRange messages) {
    std::vector<std::string> all;
    for (const auto* one : messages) all.push_back(one->description());
    return all;
  }

  ShapeTable shapes;
  KeptMessages messages;
};

TEST_F(KeptMessagesTest, AddsACopyOfAllThatAMessageHas) {
  TWReportingSessionMessage record({{"a", 1}}, 4, 7);
  record.isRedundant = true;
  record.isSessionStarted = true;
  record.details.setDestinationWorkers({&TWReportingSessionMetriconWorker::kWorkerClass});
  messages.add(record);
  record.message.set("a", 2);
  record.details.setDestinationWorkers({});
  const auto* kept = messages.back();
  EXPECT_EQ(kept->message.integer("a"), 1);
  EXPECT_EQ(kept->category, 4U);
  EXPECT_EQ(kept->type, 7);
  EXPECT_TRUE(kept->isRedundant);
  EXPECT_TRUE(kept->isSessionStarted);
  EXPECT_THAT(kept->details.destinationWorkers(),
              ElementsAre(&TWReportingSessionMetriconWorker::kWorkerClass));
}

TEST_F(KeptMessagesTest, SharesThePayloadsOfAFewMessagesOnly) {
  for (std::size_t count = 0; count <= KeptMessages::kFewMessages; ++count) {
    const TWReportingSessionMessage record(payload(1, 1), 4, 1);
    messages.add(record);
    EXPECT_EQ(messages.back()->message.sharesStorageWith(record.message), count < KeptMessages::kFewMessages)
        << count;
  }
}

TEST_F(KeptMessagesTest, CountsWhatFewMessagesTakeOnTheHeapAndThenRegions) {
  std::size_t counted = 0;
  for (std::size_t count = 0; count < KeptMessages::kFewMessages; ++count) {
    const TWReportingSessionMessage record(payload(1, 1), 4, 1);
    EXPECT_GT(messages.bytesFor(record), sizeof(record) + record.message.bytes());
    counted += messages.bytesFor(record);
    messages.add(record);
  }
  const TWReportingSessionMessage record(payload(1, 1), 4, 1);
  EXPECT_GT(messages.bytesFor(record), PackedChunk::kBytes);
  EXPECT_LT(messages.bytesFor(record), 3 * counted);
  messages.add(record);
  EXPECT_LT(messages.bytesFor(record), record.message.bytes() + 2 * sizeof(record));
}

TEST_F(KeptMessagesTest, AMessageStaysWhereItIsAndMayBeChanged) {
  auto* first = &messages.add(TWReportingSessionMessage({{"a", 1}}, 4, 1));
  for (int number = 0; number < 1'000; ++number) {
    messages.add(TWReportingSessionMessage(payload(number, number), 4, 1));
  }
  EXPECT_EQ(messages.front(), first);
  first->message.set("a", 2);
  EXPECT_EQ(messages[0]->message.integer("a"), 2);
}

TEST_F(KeptMessagesTest, PayloadsOfOthersLiveOnWhenItIsCleared) {
  for (int number = 0; number < 200; ++number) {
    messages.add(TWReportingSessionMessage(payload(number, number), 4, 1));
  }
  const ValueMap last = messages.back()->message;
  messages.clear();
  EXPECT_TRUE(messages.empty());
  EXPECT_THAT(descriptionsOf(messages), IsEmpty());
  EXPECT_EQ(last.integer("n"), 199);
  messages.add(TWReportingSessionMessage(payload(1, 5), 4, 1));
  EXPECT_EQ(messages.back()->message.integer("n"), 5);
}

TEST_F(KeptMessagesTest, CanBeWalkedBackwards) {
  for (int number = 0; number < 3; ++number) {
    messages.add(TWReportingSessionMessage(payload(number, number), 4, 1));
  }
  std::vector<std::int64_t> numbers;
  for (auto at = messages.rbegin(); at != messages.rend(); ++at) {
    numbers.push_back((*at)->message.integer("n"));
  }
  EXPECT_THAT(numbers, ElementsAre(2, 1, 0));
}

TEST_F(KeptMessagesTest, AreNotMovedWhenTheyAreInOrder) {
  for (const double time : {1.0, 1.0, 2.0}) messages.add(TWReportingSessionMessage(payload(time, 1), 4, 1));
  EXPECT_THAT(placesByTime(messages), IsEmpty());
  messages.add(TWReportingSessionMessage(payload(1.5, 1), 4, 1));
  EXPECT_THAT(placesByTime(messages), ElementsAre(0, 1, 3, 2));
}

RC_GTEST_FIXTURE_PROP(KeptMessagesTest, HoldsAndSortsWhatAVectorOfRecordsDoes, ()) {
  TWReportingSessionMessages records;
  const auto steps = *rc::gen::container<std::vector<int>>(rc::gen::inRange(-2, 10));
  double time = 0;
  for (std::size_t round = 0; round < 4; ++round) {
    for (const int step : steps) {
      time += step;
      const auto number = static_cast<int>(records.size());
      ValueMap values = step == 9 ? ValueMap{{"n", number}} : payload(time, number);
      records.push_back(std::make_shared<TWReportingSessionMessage>(std::move(values), 4, 1));
      messages.add(*records.back());
    }
  }
  RC_ASSERT(descriptionsOf(messages) == descriptionsOf(records));
  messages.sortByTime();
  TWReportingSessionMessage::sortMessages(records);
  RC_ASSERT(descriptionsOf(messages) == descriptionsOf(records));
}

}  // namespace
}  // namespace tonewerk
