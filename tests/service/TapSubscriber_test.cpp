// SPDX-License-Identifier: Apache-2.0
#include "service/TapSubscriber.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "support/PackedMaps.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// Collects the answers, in order.
class Answers final : public ReplySink {
 public:
  void reply(std::uint32_t /*requestIdentifier*/, const std::optional<ReplyError>& error,
             const std::optional<Value>& result) override {
    ASSERT_FALSE(error);
    ASSERT_TRUE(result && result->asMap());
    all.push_back(*result->asMap());
  }
  std::vector<ValueMap> all;
};

// Counts the finished requests.
class FinishedCounter final : public InFlightCounter {
 public:
  void finished(std::size_t /*bytes*/) override { ++count; }
  int count = 0;
};

class TapSubscriberTest : public ReportingTest {
 protected:
  TapSubscriberTest() {
    session->setServiceType(7);
    watcher->open({});
  }

  void offer(ValueMap payload, AudioEventCategory category = 4, AudioEventType type = 1) {
    watcher->offer(*session, TWReportingSessionMessage(std::move(payload), category, type));
  }
  void offerNumbers(int first, int last) {
    for (int number = first; number <= last; ++number) offer({{"number", number}});
  }
  void ask() { watcher->next(Reply(answers, 1), InFlightToken(finishedRequests, 0)); }
  // Sends a request and returns its answer; empty when the request is held back.
  ValueMap next() {
    answers->all.clear();
    ask();
    return answers->all.empty() ? ValueMap() : answers->all.back();
  }

  static std::vector<std::int64_t> numbersIn(const ValueMap& answer) {
    std::vector<std::int64_t> numbers;
    for (const Value& message : *answer.find("messages")->asArray()) {
      numbers.push_back(message.asMap()->find("payload")->asMap()->integer("number"));
    }
    return numbers;
  }
  // Returns `levels` maps, each inside the one before.
  static ValueMap nested(std::size_t levels) {
    ValueMap map{{"number", 1}};
    for (std::size_t level = 1; level < levels; ++level) map = ValueMap{{"inner", map}};
    return map;
  }

  std::shared_ptr<TWReportingSession> session = makeSession(77);
  std::shared_ptr<TapSubscriber> watcher = std::make_shared<TapSubscriber>();
  std::shared_ptr<Answers> answers = std::make_shared<Answers>();
  std::shared_ptr<FinishedCounter> finishedRequests = std::make_shared<FinishedCounter>();
};

TEST_F(TapSubscriberTest, DescribesEachMessage) {
  TWReportingSessionMessage record(
      {{"twreporting_timestamp", 1763634000.5}, {"HostApplicationDisplayID", "com.example.player"}}, 4, 1);
  record.isRedundant = true;
  watcher->offer(*session, record);
  EXPECT_EQ(next().text(),
            R"({"missed":0,"messages":[{"reporterID":77,"serviceType":7,"category":4,"type":1,)"
            R"("redundant":true,"time":1763634000.5,"application":"com.example.player","payload":)"
            R"({"twreporting_timestamp":1763634000.5,"HostApplicationDisplayID":"com.example.player"}}]})");
}

TEST_F(TapSubscriberTest, AMessageHasTheDeviceThatItsSessionNamedLast) {
  const auto devices = [this] {
    const ValueMap answer = next();
    std::vector<std::string> found;
    for (const Value& message : *answer.find("messages")->asArray())
      found.push_back(message.asMap()->text("device"));
    return found;
  };
  offer({{"number", 1}});
  session->addPreviousValues({{"active_devices", "Speaker"}, {"number", 2}});
  offer({{"number", 2}});
  session->addPreviousValues({{"active_devices", std::string(1000, 'x')}});
  offer({{"number", 3}});
  EXPECT_THAT(devices(), ElementsAre("", "Speaker", std::string(64, 'x')));
  EXPECT_EQ(watcher->waitingBytes(), 0U);
}

TEST_F(TapSubscriberTest, GivesEachMessageOnceInOrder) {
  offerNumbers(1, 3);
  EXPECT_THAT(numbersIn(next()), ElementsAre(1, 2, 3));
  offerNumbers(4, 4);
  EXPECT_THAT(numbersIn(next()), ElementsAre(4));
  EXPECT_EQ(watcher->waitingBytes(), 0U);
}

TEST_F(TapSubscriberTest, CopiesNoPayload) {
  const ValueMap payload{{"number", 1}};
  offer(payload);
  const ValueMap answer = next();
  const ValueMap& message = *answer.find("messages")->asArray()->begin()->asMap();
  EXPECT_TRUE(message.find("payload")->asMap()->sharesStorageWith(payload));
}

TEST_F(TapSubscriberTest, HoldsARequestBackUntilThereIsAMessage) {
  ask();
  test.queues.runAll();
  EXPECT_THAT(answers->all, IsEmpty());
  EXPECT_EQ(finishedRequests->count, 0);
  offerNumbers(1, 1);
  test.queues.runAll();
  ASSERT_THAT(answers->all, SizeIs(1));
  EXPECT_THAT(numbersIn(answers->all[0]), ElementsAre(1));
  EXPECT_EQ(finishedRequests->count, 1);
  offerNumbers(2, 2);
  test.queues.runAll();
  EXPECT_THAT(answers->all, SizeIs(1)) << "answered twice";
}

TEST_F(TapSubscriberTest, AnswersAHeldRequestOnceForAllMessagesUntilThen) {
  ask();
  offerNumbers(1, 3);
  EXPECT_THAT(answers->all, IsEmpty());
  test.queues.runAll();
  ASSERT_THAT(answers->all, SizeIs(1));
  EXPECT_THAT(numbersIn(answers->all[0]), ElementsAre(1, 2, 3));
}

TEST_F(TapSubscriberTest, AnswersTheHeldRequestWithNothingWhenAnotherComes) {
  ask();
  ask();
  ASSERT_THAT(answers->all, SizeIs(1));
  EXPECT_EQ(answers->all[0].text(), R"({"missed":0,"messages":[]})");
  EXPECT_EQ(finishedRequests->count, 1);
  offerNumbers(1, 1);
  test.queues.runAll();
  ASSERT_THAT(answers->all, SizeIs(2));
  EXPECT_THAT(numbersIn(answers->all[1]), ElementsAre(1));
}

TEST_F(TapSubscriberTest, DoesNotAnswerTheLaterRequestWithNothingWhenTheEarlierTookAll) {
  ask();
  offerNumbers(1, 1);
  ask();  // answers the first request with the message
  test.queues.runAll();
  ASSERT_THAT(answers->all, SizeIs(1));
  EXPECT_THAT(numbersIn(answers->all[0]), ElementsAre(1));
  offerNumbers(2, 2);
  test.queues.runAll();
  ASSERT_THAT(answers->all, SizeIs(2));
  EXPECT_THAT(numbersIn(answers->all[1]), ElementsAre(2));
}

TEST_F(TapSubscriberTest, ShowsOnlyMessagesThatMatchTheFilter) {
  watcher->open({{77}, {4, 5}, {1}});
  offer({{"number", 1}}, 4, 1);
  offer({{"number", 2}}, 6, 1);
  offer({{"number", 3}}, 5, 2);
  offer({{"number", 4}}, 5, 1);
  EXPECT_THAT(numbersIn(next()), ElementsAre(1, 4));
  watcher->open({{78}, {}, {}});
  offerNumbers(5, 5);
  EXPECT_EQ(next(), ValueMap());
}

TEST_F(TapSubscriberTest, MissesTheOldestMessagesOverTheLimitOfMessages) {
  const int most = static_cast<int>(TapSubscriber::kMaxMessages);
  offerNumbers(1, most);
  EXPECT_EQ(watcher->waitingMessages(), TapSubscriber::kMaxMessages);
  offerNumbers(most + 1, most + 2);
  EXPECT_EQ(watcher->waitingMessages(), TapSubscriber::kMaxMessages);
  const ValueMap answer = next();
  EXPECT_EQ(answer.integer("missed"), 2);
  EXPECT_EQ(numbersIn(answer).front(), 3);
  EXPECT_EQ(next().integer("missed"), 0) << "told twice";
}

TEST_F(TapSubscriberTest, MissesTheOldestMessagesOverTheLimitOfBytes) {
  const std::string text(100'000, 'x');
  for (int number = 1; number <= 50; ++number) offer({{"number", number}, {"text", text}});
  EXPECT_LE(watcher->waitingBytes(), TapSubscriber::kMaxBytes);
  EXPECT_EQ(watcher->waitingMessages(), 41U);
  std::vector<std::int64_t> numbers;
  std::int64_t missed = 0;
  while (watcher->waitingMessages() > 0) {
    const ValueMap answer = next();
    missed += answer.integer("missed");
    for (const std::int64_t number : numbersIn(answer)) numbers.push_back(number);
  }
  EXPECT_EQ(missed, 9);
  EXPECT_THAT(numbers, SizeIs(41));
  EXPECT_EQ(numbers.front(), 10);
  EXPECT_EQ(numbers.back(), 50);
}

TEST_F(TapSubscriberTest, AnAnswerStaysWithinItsLimit) {
  const std::string text(200'000, 'x');
  for (int number = 1; number <= 5; ++number) offer({{"number", number}, {"text", text}});
  EXPECT_THAT(numbersIn(next()), ElementsAre(1, 2));
  EXPECT_THAT(numbersIn(next()), ElementsAre(3, 4));
  EXPECT_THAT(numbersIn(next()), ElementsAre(5));
}

TEST_F(TapSubscriberTest, MissesAMessageLargerThanAnAnswer) {
  ValueMap payload{{"number", 1}, {"text", ""}};
  const std::size_t room = TapSubscriber::kMaxAnswerBytes - TapSubscriber::kRecordBytes - payload.bytes();
  payload.set("text", std::string(room, 'x'));
  offer(payload);
  payload.set("text", std::string(room + 1, 'x'));
  offer(payload);
  const ValueMap answer = next();
  EXPECT_EQ(answer.integer("missed"), 1);
  EXPECT_THAT(numbersIn(answer), ElementsAre(1));
}

// The keys of packed messages are in their shape, which all of them share. In an answer each has its own.
TEST_F(TapSubscriberTest, CountsTheKeysOfPackedMessages) {
  ShapeTable shapes;
  const std::string key(100'000, 'k');
  for (int number = 1; number <= 5; ++number) {
    offer(packedMapOf({{"number", number}, {key + "1", true}, {key + "2", true}}, shapes));
  }
  EXPECT_THAT(numbersIn(next()), ElementsAre(1, 2));
  EXPECT_THAT(numbersIn(next()), ElementsAre(3, 4));
  EXPECT_THAT(numbersIn(next()), ElementsAre(5));
}

TEST_F(TapSubscriberTest, MissesAPayloadThatIsNestedTooDeepForAnAnswer) {
  offer(nested(TapSubscriber::kMaxPayloadLevels));
  offer(nested(TapSubscriber::kMaxPayloadLevels + 1));
  const ValueMap answer = next();
  EXPECT_EQ(answer.integer("missed"), 1);
  EXPECT_THAT(*answer.find("messages")->asArray(), SizeIs(1));
}

TEST_F(TapSubscriberTest, AnswersAHeldRequestWhenAMessageWasOnlyMissed) {
  ask();
  offer({{"text", std::string(TapSubscriber::kMaxAnswerBytes, 'x')}});
  test.queues.runAll();
  ASSERT_THAT(answers->all, SizeIs(1));
  EXPECT_EQ(answers->all[0].text(), R"({"missed":1,"messages":[]})");
}

TEST_F(TapSubscriberTest, StartsOverWhenItIsOpenedAgain) {
  offerNumbers(1, static_cast<int>(TapSubscriber::kMaxMessages) + 1);
  watcher->open({});
  EXPECT_EQ(watcher->waitingMessages(), 0U);
  EXPECT_EQ(watcher->waitingBytes(), 0U);
  offerNumbers(7, 7);
  EXPECT_EQ(next().integer("missed"), 0);
}

TEST_F(TapSubscriberTest, MayEndWhileAnAnswerIsQueued) {
  ask();
  offerNumbers(1, 1);
  watcher = nullptr;
  test.queues.runAll();
  EXPECT_THAT(answers->all, IsEmpty());
  EXPECT_EQ(finishedRequests->count, 1);
}

TEST_F(TapSubscriberTest, CutsALongApplicationName) {
  offer({{"HostApplicationDisplayID", std::string(1000, 'x')}});
  const ValueMap answer = next();
  EXPECT_EQ(answer.find("messages")->asArray()->begin()->asMap()->text("application").size(), 256U);
}

}  // namespace
}  // namespace tonewerk
