// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionMessage.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <gtest/gtest.h>
#include <mutex>
#include <rapidcheck/gtest.h>
#include <thread>
#include <vector>

#include "support/ReportingTest.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class TWReportingSessionMessageTest : public ReportingTest {};

TEST_F(TWReportingSessionMessageTest, ANewMessageIsNotRedundantNotStartedAndHasNoDestinations) {
  const TWReportingSessionMessage record({{"a", 1}}, 4, 1);
  EXPECT_EQ(record.category, 4U);
  EXPECT_EQ(record.type, 1);
  EXPECT_FALSE(record.isRedundant);
  EXPECT_FALSE(record.isSessionStarted);
  EXPECT_THAT(record.details.destinationWorkers(), IsEmpty());
}

TEST_F(TWReportingSessionMessageTest, ItsPayloadIsItsOwn) {
  const ValueMap payload{{"a", 1}};
  TWReportingSessionMessage record(payload, 4, 1);
  record.message.set("a", 2);
  EXPECT_EQ(payload.integer("a"), 1);
}

TEST_F(TWReportingSessionMessageTest, ACopyIsIndependentAndHasNoDestinations) {
  TWReportingSessionMessage record({{"nested", ValueMap{{"x", 1}}}}, 0x20000004, 7);
  record.isRedundant = true;
  record.isSessionStarted = true;
  record.details.setDestinationWorkers({&TWReportingSessionMetriconWorker::kWorkerClass});

  const auto copy = record.copyWithZone();
  record.message.set("nested", 5);

  EXPECT_EQ(copy->message, (ValueMap{{"nested", ValueMap{{"x", 1}}}}));
  EXPECT_EQ(copy->category, 0x20000004U);
  EXPECT_EQ(copy->type, 7);
  EXPECT_TRUE(copy->isRedundant);
  EXPECT_TRUE(copy->isSessionStarted);
  EXPECT_THAT(copy->details.destinationWorkers(), IsEmpty());
  EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDebug), ElementsAre("copyWithZone"));
}

TEST_F(TWReportingSessionMessageTest, DetailsAreCopiedWithTheirWorkersAndTheirStretch) {
  const MessageDetails none;
  EXPECT_TRUE(none.empty());
  EXPECT_EQ(none.stretch(), std::nullopt);
  MessageDetails details;
  details.setDestinationWorkers({&TWReportingSessionMetriconWorker::kWorkerClass, nullptr});
  details.setStretch({1.0, 2.5});
  const MessageDetails copy = details;
  details = none;
  EXPECT_THAT(details.destinationWorkers(), IsEmpty());
  EXPECT_EQ(details.stretch(), std::nullopt);
  EXPECT_THAT(copy.destinationWorkers(),
              ElementsAre(&TWReportingSessionMetriconWorker::kWorkerClass, nullptr));
  EXPECT_EQ(copy.stretch(), (TimeStretch{1.0, 2.5}));
}

TEST_F(TWReportingSessionMessageTest, DescribesItselfByCategoryTypeAndPayload) {
  EXPECT_EQ(TWReportingSessionMessage({{"a", 1}}, 4, 1).description(),
            R"(category=Playback type=Start {"a":1})");
}

TEST_F(TWReportingSessionMessageTest, ItsTimeIsItsTimestampOrZero) {
  EXPECT_EQ(messageAt(12.5, {})->epochTime(), 12.5);
  EXPECT_EQ(message({{"twreporting_timestamp", "12.5"}})->epochTime(), 12.5);
  EXPECT_EQ(message({})->epochTime(), 0.0);
}

TEST_F(TWReportingSessionMessageTest, SortsByTimeStablyWithMessagesWithoutTimeFirst) {
  TWReportingSessionMessages messages{messageAt(5, {{"n", "a"}}), message({{"n", "b"}}),
                                      messageAt(1, {{"n", "c"}}), messageAt(5, {{"n", "d"}}),
                                      message({{"n", "e"}}),      messageAt(1, {{"n", "f"}})};
  TWReportingSessionMessage::sortMessages(messages);
  EXPECT_THAT(textsUnder("n", messages), ElementsAre("b", "e", "c", "f", "a", "d"));
}

TEST_F(TWReportingSessionMessageTest, SortsATimeThatIsNotANumberAsNoTime) {
  TWReportingSessionMessages messages{messageAt(2, {{"n", "a"}}), messageAt(std::nan(""), {{"n", "b"}}),
                                      messageAt(1, {{"n", "c"}}), messageAt(-1, {{"n", "d"}})};
  TWReportingSessionMessage::sortMessages(messages);
  EXPECT_THAT(textsUnder("n", messages), ElementsAre("d", "b", "c", "a"));
}

RC_GTEST_FIXTURE_PROP(TWReportingSessionMessageTest, SortsLikeAStableSortOfTheTimes, ()) {
  TWReportingSessionMessages messages;
  double time = 0;
  for (const int step : *rc::gen::container<std::vector<int>>(rc::gen::inRange(-1, 4))) {
    time += *rc::gen::inRange(0, 8) == 0 ? step : std::abs(step);  // mostly in order
    messages.push_back(*rc::gen::inRange(0, 20) == 0 ? message({}) : messageAt(time, {}));
  }
  TWReportingSessionMessages expected = messages;
  std::stable_sort(expected.begin(), expected.end(),
                   [](const auto& a, const auto& b) { return a->epochTime() < b->epochTime(); });
  const bool isInOrder = expected == messages;
  RC_CLASSIFY(isInOrder, "in order");

  RC_ASSERT(TWReportingSessionMessage::sortMessages(messages) == !isInOrder);
  RC_ASSERT(messages == expected);  // the same records
}

TEST_F(TWReportingSessionMessageTest, ItsLockExcludesOthers) {
  const TWReportingSessionMessage record({}, 4, 1);
  int count = 0;
  const auto work = [&] {
    for (int i = 0; i < 1000; ++i) {
      const std::lock_guard lock(record);
      ++count;
    }
  };
  std::thread other(work);
  work();
  other.join();
  EXPECT_EQ(count, 2000);
}

}  // namespace
}  // namespace tonewerk
