// SPDX-License-Identifier: Apache-2.0
#include <cmath>
#include <gmock/gmock.h>
#include <limits>
#include <memory>
#include <rapidcheck.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <vector>

#include "platform/linux/channels/ChannelFile.h"
#include "support/ChannelRecords.h"

// These tests show how a file is read again whose numbers have changed.

namespace tonewerk {
namespace {

std::string simpleOf(const std::string& value, const std::string& rest = "") {
  return R"({"driver": "Amp", "channels": [{"group": "Speaker", "name": "Rail 1", "format": "simple", )"
         R"("value": )" +
         value + "}]" + rest + "}";
}
std::string stateOf(const std::string& transitions, const std::string& dutyCycle) {
  return R"({"driver": "Amp", "channels": [{"group": "g", "name": "n", "format": "state", "states": [)"
         R"({"name": "on", "transitions": 3, "residency": 4, "duty_cycle": 0.5}, )"
         R"({"name": "off", "duty_cycle": )" +
         dutyCycle + R"(, "transitions": )" + transitions + R"(, "residency": 7}]}]})";
}

std::optional<ChannelFile> parsed(const std::string& text) {
  ChannelFileProblem problem;
  return ChannelFile::parse(text, problem);
}

// Reads `text` after `previous`. None if it has to be parsed; else the result must be that of parsing it.
std::optional<std::vector<ChanmeterRecord>> updated(const std::string& previous, const std::string& text) {
  std::optional<ChannelFile> file = parsed(previous);
  EXPECT_TRUE(file) << previous;
  if (!file || !file->update(previous, text)) return std::nullopt;
  const std::optional<ChannelFile> whole = parsed(text);
  EXPECT_TRUE(whole) << text;
  if (whole) {
    EXPECT_EQ(channels::plain(file->records), channels::plain(whole->records)) << text;
    EXPECT_EQ(file->driver, whole->driver);
  }
  return channels::plain(file->records);
}

TEST(ChannelFileUpdateTest, ReadsTheNumbersOfEveryFormat) {
  const auto textOf = [](const std::string& a, const std::string& b) {
    return R"({"time": )" + a + R"(, "driver": "Amp 1", "channels": [
      {"group": "Tx", "name": "Delay", "format": "histogram", "max": )" +
           a + R"(, "min": )" + b + R"(, "buckets": [{"lower": 0, "upper": 10, "hits": )" + a +
           R"(}, {"hits": )" + b + R"(, "upper": )" + a + R"(}]},
      {"group": "Speaker", "subgroup": "2", "name": "Rail", "unit": "mV", "format": "simple", "value": )" +
           b + R"(},
      {"group": "pdm", "name": "Mic", "format": "state", "min": )" +
           b + R"(, "states": [{"name": "on", "transitions": )" + a + R"(, "residency": )" + b +
           R"(, "duty_cycle": )" + a + R"(.25e-2}]}]})";
  };
  const auto records = updated(textOf("1", "22"), textOf("333", "4"));
  ASSERT_TRUE(records);
  EXPECT_EQ(records->at(0).maximum, 333);
  EXPECT_EQ(records->at(0).minimum, 4);
  EXPECT_THAT(records->at(0).buckets,
              testing::ElementsAre(ChanmeterBucket{0, 10, 333}, ChanmeterBucket{{}, 333, 4}));
  EXPECT_EQ(records->at(1).value, 4);
  EXPECT_THAT(records->at(2).states, testing::ElementsAre(ChanmeterState{"on", 333, 4, 3.3325}));
}

TEST(ChannelFileUpdateTest, ReadsOneTextAfterTheOther) {
  std::optional<ChannelFile> file = parsed(simpleOf("9"));
  ASSERT_TRUE(file);
  const ChanmeterRecords first = file->records;
  std::string previous = simpleOf("9");
  for (const int value : {10, -123456, 7, 7, 99999}) {
    const std::string text = simpleOf(std::to_string(value));
    ASSERT_TRUE(file->update(previous, text)) << text;
    EXPECT_EQ(file->records.at(0)->value, value);
    previous = text;
  }
  EXPECT_EQ(first.at(0)->value, 9);
}

TEST(ChannelFileUpdateTest, ReadsEveryIntegerThatItsFieldCanHold) {
  EXPECT_EQ(updated(simpleOf("1"), simpleOf("-9223372036854775808")).value().at(0).value,
            std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(updated(simpleOf("1"), simpleOf("9223372036854775807")).value().at(0).value,
            std::numeric_limits<std::int64_t>::max());
  EXPECT_EQ(
      updated(stateOf("1", "1"), stateOf("18446744073709551615", "1")).value().at(0).states.at(1).transitions,
      std::numeric_limits<std::uint64_t>::max());
}

TEST(ChannelFileUpdateTest, ReadsDutyCyclesLikeTheParser) {
  for (const char* number :
       {"0", "-0", "-0.0", "0.1", "1e-3", "12345678901234567890", "1.7976931348623157e308",
        "9007199254740993", "123456789012345678901234567890", "5e-324"}) {
    EXPECT_TRUE(updated(stateOf("1", "0.5"), stateOf("1", number))) << number;
  }
  const double zero = updated(stateOf("1", "0.5"), stateOf("1", "-0")).value().at(0).states.at(1).dutyCycle;
  EXPECT_FALSE(std::signbit(zero));
}

TEST(ChannelFileUpdateTest, RefusesNumbersOfAnotherFormOrRange) {
  for (const char* number : {"9223372036854775808", "1.0", "1e3", "01", "-01", "-", "+1", "", "\"1\"", "null",
                             "0x1", "1 2", "1,", "--1"}) {
    EXPECT_FALSE(updated(simpleOf("1"), simpleOf(number))) << number;
    EXPECT_FALSE(updated(simpleOf("0"), simpleOf(number))) << number;
  }
  EXPECT_FALSE(updated(stateOf("1", "1"), stateOf("-1", "1")));
  for (const char* number : {"1e999", "inf", "nan", "1.", ".5", "00.5", "1e"}) {
    EXPECT_FALSE(updated(stateOf("1", "1"), stateOf("1", number))) << number;
    EXPECT_FALSE(
        updated(simpleOf("1", R"(, "note": 1)"), simpleOf("1", R"(, "note": )" + std::string(number))))
        << number;
  }
}

TEST(ChannelFileUpdateTest, RefusesATextThatDiffersElsewhere) {
  const std::string text = simpleOf("1");
  EXPECT_FALSE(updated(text, text + " "));
  EXPECT_FALSE(updated(text + " ", text));
  EXPECT_FALSE(updated(text, simpleOf("1", R"(, "note": 1)")));
  EXPECT_FALSE(updated(text, ""));
  for (std::size_t at = 0; at < text.size(); ++at) {
    EXPECT_FALSE(updated(text, text.substr(0, at)));
    if (text[at] == '1' && at > text.size() - 6) continue;  // the value
    std::string other = text;
    other[at] = other[at] == 'x' ? 'y' : 'x';
    EXPECT_FALSE(updated(text, other)) << other;
  }
}

TEST(ChannelFileUpdateTest, OfAFieldGivenTwiceTheLastCountsAndTheFirstMayBeAnyNumber) {
  const auto records = updated(simpleOf(R"(1, "value": 2)"), simpleOf(R"(1.5, "value": 3)"));
  ASSERT_TRUE(records);
  EXPECT_EQ(records->at(0).value, 3);
}

TEST(ChannelFileUpdateTest, ReadsAFileWithoutChannels) {
  const auto textOf = [](int time) {
    return R"({"driver": "Amp", "time": )" + std::to_string(time) + R"(, "channels": []})";
  };
  EXPECT_THAT(updated(textOf(1), textOf(23)).value(), testing::IsEmpty());
}

TEST(ChannelFileUpdateTest, ParsesATextThatHasFarMoreNumbersThanItsRecords) {
  std::string many = R"(, "note": [1)";
  for (int count = 0; count < 1000; ++count) many += ",1";
  EXPECT_FALSE(updated(simpleOf("1", many + "]"), simpleOf("2", many + "]")));
}

TEST(ChannelFileUpdateTest, IgnoresWhatFollowsAZeroByteLikeTheParser) {
  const std::string rest = std::string("\0 5", 3);
  EXPECT_TRUE(updated(simpleOf("1") + rest, simpleOf("2") + rest));
  EXPECT_FALSE(updated(simpleOf("1") + rest, simpleOf("2")));
}

// Replaces a few characters of a text by others that a number or JSON may have. If the result is read without
// parsing it, it is what parsing gives.
RC_GTEST_PROP(ChannelFileUpdateProperties, NeverDiffersFromParsing, ()) {
  const std::string previous =
      *rc::gen::element(simpleOf("10", R"(, "note": [1, -2.5])"), stateOf("20", "0.25"), simpleOf("-7"));
  std::string text = previous;
  const auto edits = *rc::gen::inRange(1, 4);
  for (int edit = 0; edit < edits; ++edit) {
    const auto at = *rc::gen::inRange<std::size_t>(0, text.size());
    const std::size_t size = *rc::gen::inRange<std::size_t>(0, 3);
    text.replace(at, size,
                 *rc::gen::container<std::string>(rc::gen::elementOf(std::string("0123456789-+.eE \"],}"))));
  }
  std::optional<ChannelFile> file = parsed(previous);
  if (!file->update(previous, text)) return;
  const std::optional<ChannelFile> whole = parsed(text);
  RC_ASSERT(whole.has_value());
  RC_ASSERT(channels::plain(file->records) == channels::plain(whole->records));
}

// The same, with numbers in the places of numbers, most of which need no parsing.
RC_GTEST_PROP(ChannelFileUpdateProperties, ReadsOtherNumbersLikeParsing, ()) {
  const std::string previous = stateOf("20", "0.25");
  const std::string text = stateOf(
      std::to_string(*rc::gen::arbitrary<std::uint64_t>()),
      std::to_string(*rc::gen::arbitrary<std::int64_t>()) + *rc::gen::element("", ".5", "e3", ".75E-2"));
  std::optional<ChannelFile> file = parsed(previous);
  RC_ASSERT(file->update(previous, text));
  const std::optional<ChannelFile> whole = parsed(text);
  RC_ASSERT(whole.has_value());
  RC_ASSERT(channels::plain(file->records) == channels::plain(whole->records));
}

}  // namespace
}  // namespace tonewerk
