// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <gtest/gtest.h>
#include <memory>
#include <rapidcheck/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "support/ReportingTest.h"

namespace tonewerk {

// A message of a stream: seconds, then what it says.
struct Step {
  double at;
  ValueMap says;
};

// A stream and the summaries expected of it, in a short form that a reader can check by eye.
struct StreamCase {
  std::string name;
  std::vector<Step> stream;
  std::vector<std::string> expected;
};

inline const Value kOn(true);
inline const Value kOff(false);

// What the tests of the producers of summaries begin with: a session, and streams to fold.
class ProducerTest : public ReportingTest {
 protected:
  explicit ProducerTest(Classes workerClasses)
      : ReportingTest(std::move(workerClasses)), session(makeSession()) {}

  static TWReportingSessionMessages stream(const std::vector<Step>& steps) {
    TWReportingSessionMessages messages;
    for (const Step& step : steps) messages.push_back(messageAt(step.at, step.says));
    return messages;
  }

  // For properties: a short stream of messages a second apart, with some of `keys` and values of every kind.
  // Most of it makes sense, so that there are summaries; the times are among the keys.
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

  std::shared_ptr<TWReportingSession> session;
};

}  // namespace tonewerk
