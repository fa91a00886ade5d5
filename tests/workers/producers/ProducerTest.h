// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cmath>
#include <cstdint>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <rapidcheck/gtest.h>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "session/TWReportingSessionWorkerUtility.h"
#include "support/ReportingTest.h"
#include "workers/producers/PlainWalk.h"

namespace tonewerk {

// A message of a stream: its time in seconds, and what it says.
struct Step {
  double at;
  ValueMap says;
};

// A stream and its expected summaries, in a short form that a reader can check by eye.
struct StreamCase {
  std::string name;
  std::vector<Step> stream;
  std::vector<std::string> expected;
};

inline const Value kOn(true);
inline const Value kOff(false);

// The fixture of the tests of producers of summaries. It has a session, makes streams of messages, and checks
// what all producers have in common.
class ProducerTest : public ReportingTest {
 protected:
  explicit ProducerTest(Classes workerClasses)
      : ReportingTest(std::move(workerClasses)), session(makeSession()) {}

  // The summaries that the producer makes of stored messages. Intervals of half a second or less are too
  // short.
  virtual TWReportingSessionMessages summariesOf(const TWReportingSessionMessages& messages) = 0;
  // A summary in the short form of StreamCase.
  virtual std::string shortFormOf(const ValueMap& summary) const = 0;

  std::vector<std::string> shortFormsOf(const std::vector<Step>& steps) {
    std::vector<std::string> texts;
    for (const auto& summary : summariesOf(stream(steps))) texts.push_back(shortFormOf(summary->message));
    return texts;
  }

  static TWReportingSessionMessages stream(const std::vector<Step>& steps) {
    TWReportingSessionMessages messages;
    for (const Step& step : steps) messages.push_back(messageAt(step.at, step.says));
    return messages;
  }

  // For properties: a short stream of messages a second apart, with some of `keys` and values of every kind.
  // Most messages make sense, so that there are summaries. The times are among the keys.
  static TWReportingSessionMessages anyStream(std::vector<std::string> keys) {
    const auto anyValue = rc::gen::weightedOneOf<Value>(
        {{8, rc::gen::map(rc::gen::arbitrary<bool>(), [](bool b) { return Value(b); })},
         {4, rc::gen::map(rc::gen::inRange(-1, 3), [](int i) { return Value(i); })},
         {2, rc::gen::map(rc::gen::inRange(0, 80), [](int quarters) { return Value(quarters / 4.0); })},
         {1, rc::gen::map(rc::gen::arbitrary<double>(), [](double d) { return Value(d); })},
         {1, rc::gen::just(Value("text"))},
         {1, rc::gen::just(Value(ValueArray{1}))},
         {1, rc::gen::just(Value(std::nan("")))}});
    keys.emplace_back("twreporting_timestamp");
    TWReportingSessionMessages messages;
    const int size = *rc::gen::inRange(0, 30);
    for (int at = 0; at < size; ++at) {
      ValueMap payload;
      if (*rc::gen::inRange(0, 20) > 0) payload.set("twreporting_timestamp", at);
      for (int more = *rc::gen::inRange(0, 5); more > 0; --more) {
        payload.set(*rc::gen::elementOf(keys), *anyValue);
      }
      messages.push_back(message(payload));
    }
    return messages;
  }

  static TWReportingSessionMessages copiesOf(const TWReportingSessionMessages& messages) {
    TWReportingSessionMessages copies;
    for (const auto& original : messages) copies.push_back(original->copyWithZone());
    return copies;
  }
  static std::vector<ValueMap> payloadsOf(const TWReportingSessionMessages& messages) {
    std::vector<ValueMap> payloads;
    for (const auto& held : messages) payloads.push_back(held->message);
    return payloads;
  }

  static void expectAProducerFromTheSessionsStart(const TWReportingSessionWorkerClass& workerClass) {
    EXPECT_TRUE(workerClass.isProducer);
    EXPECT_FALSE(workerClass.isConsumer);
    EXPECT_FALSE(workerClass.startOnInit);
    EXPECT_FALSE(workerClass.handleSingleMessageSession);
  }

  // `steps` must yield two summaries.
  void expectNumbersAndACount(const std::vector<Step>& steps) {
    const auto summaries = summariesOf(stream(steps));
    EXPECT_THAT(textsUnder("msgidx", summaries), ::testing::ElementsAre("1", "2"));
    EXPECT_THAT(textsUnder("msgcnt", summaries), ::testing::ElementsAre("2", "2"));
    EXPECT_EQ(summaries[0]->message.find("msgcnt")->kind(), Value::Kind::kUnsigned);
  }

  // `start` must begin an interval that `stop` ends.
  void expectSinglePrecision(const ValueMap& start, const ValueMap& stop, const char* lengthKey) {
    const auto summaries = summariesOf(stream({{0, start}, {1.1, stop}}));
    ASSERT_THAT(summaries, ::testing::SizeIs(1));
    EXPECT_EQ(summaries[0]->message.number(lengthKey), static_cast<double>(1.1F));
  }

  void expectNoSummaryWithoutTimes(const ValueMap& start, const ValueMap& stop) {
    EXPECT_THAT(summariesOf({message(start), messageAt(10, stop)}), ::testing::IsEmpty());
    EXPECT_THAT(summariesOf({messageAt(0, start), message(stop)}), ::testing::IsEmpty());
    EXPECT_THAT(summariesOf({messageAt(0, start), messageAt(std::nan(""), stop)}), ::testing::IsEmpty());
  }

  void expectNothingOfAStopWithoutSummaries() {
    session->start();
    session->stop();
    EXPECT_THAT(test.metricon.events(), ::testing::IsEmpty());
    EXPECT_THAT(test.log.textsOf("twrr", LogLevel::kDefault), ::testing::IsEmpty());
  }

  // All debug lines must carry the producer's own source file.
  void expectDebugLinesOf(const std::string& file) {
    for (const auto& line : test.log.linesOf("twrr", LogLevel::kDebug)) {
      EXPECT_THAT(line.message, ::testing::StartsWith(file + ":"));
    }
  }

  // A property: with any stream, the walk does not crash or read the clock. The stored messages are
  // afterwards the same as after `merge`. `check` gets each summary.
  void checkAnyStream(std::vector<std::string> keys, const char* lengthKey,
                      const std::function<void(const TWReportingSessionMessages& messages)>& merge,
                      const std::function<void(const TWReportingSessionMessage& summary)>& check) {
    const auto messages = anyStream(std::move(keys));
    const auto expected = copiesOf(messages);
    merge(expected);
    const std::uint64_t clockReads = test.clock.wallReads();

    const auto summaries = summariesOf(messages);
    RC_CLASSIFY(!summaries.empty());
    RC_ASSERT(test.clock.wallReads() == clockReads);
    RC_ASSERT(payloadsOf(messages) == payloadsOf(expected));
    for (const auto& summary : summaries) {
      RC_ASSERT(summary->message.number(lengthKey) > 0.5);
      RC_ASSERT(summary->message.integer("msgcnt") == static_cast<std::int64_t>(summaries.size()));
      check(*summary);
    }
  }

  // A property: with any stream and previous values, the producer's summaries are those of `plain`, to the
  // order of their keys and the kinds of their values. Rapid spatial messages are merged first if
  // they are at most `maxPauseSeconds` apart; 0 for not at all.
  void checkAgainst(PlainWalk plain, std::vector<std::string> keys, double maxPauseSeconds) {
    const auto messages = anyStream(keys);
    ValueMap previous;
    for (const auto& record : anyStream(keys)) {
      previous.merge(record->message);
      if (previous.size() > 3) break;
    }
    const auto owner = makeSession();
    owner->addPreviousValues(previous);
    const auto merged =
        maxPauseSeconds > 0 ? PlainWalk::combined(messages, maxPauseSeconds) : copiesOf(messages);
    const std::vector<ValueMap> expected = plain.summariesOf(merged, previous);
    session = owner;

    const auto summaries = summariesOf(messages);
    RC_CLASSIFY(expected.size() > 1);
    RC_ASSERT(exactTextsOf(payloadsOf(summaries)) == exactTextsOf(expected));
  }

  // Also shows what the compact JSON does not: the kinds of numbers, and numbers that JSON cannot express.
  static std::vector<std::string> exactTextsOf(const std::vector<ValueMap>& maps) {
    std::vector<std::string> texts;
    for (const ValueMap& map : maps) {
      std::string& text = texts.emplace_back(map.text());
      for (const ValueMap::Entry& entry : map) {
        text += ' ' + std::to_string(static_cast<int>(entry.value.kind())) + ' ' + entry.value.text();
      }
    }
    return texts;
  }

  // Merges rapid spatial messages as the producers of volume and input summaries do.
  static void mergeRapidSpatialMessages(const TWReportingSessionMessages& messages, double maxPauseSeconds) {
    const std::array<std::string_view, 2> keys{"spatial-audio-accessory-feature", "spatializationEnabled"};
    TWReportingSessionWorkerUtility::combineRapidMessages(messages, keys, maxPauseSeconds);
  }

  std::shared_ptr<TWReportingSession> session;
};

}  // namespace tonewerk
