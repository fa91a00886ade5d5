// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/ChannelFile.h"

#include <gmock/gmock.h>
#include <limits>
#include <string>
#include <vector>

#include "platform/linux/channels/ChannelFailures.h"
#include "support/ChannelRecords.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

constexpr char kDriver[] = "Amp Drv<0x1>";

std::string fileOf(const std::string& channels) {
  return std::string(R"({"driver": ")") + kDriver + R"(", "channels": [)" + channels + "]}";
}
std::string simpleOf(const std::string& value) {
  return fileOf(R"({"group": "Speaker", "name": "Rail Volts", "format": "simple", "value": )" + value + "}");
}
std::string histogramOf(const std::string& buckets, const std::string& rest = R"("min": 1, "max": 90)") {
  return fileOf(R"({"group": "Tx", "name": "Delay", "format": "histogram", )" + rest + R"(, "buckets": )" +
                buckets + "}");
}
std::string statesOf(const std::string& states) {
  return fileOf(R"({"group": "pdm", "name": "Mic", "format": "state", "states": )" + states + "}");
}

std::vector<ChanmeterRecord> recordsOf(const std::string& text) {
  ChannelFileProblem problem;
  const std::optional<ChannelFile> file = ChannelFile::parse(text, problem);
  EXPECT_TRUE(file) << problem.text;
  return file ? channels::plain(file->records) : std::vector<ChanmeterRecord>();
}

struct Case {
  std::string text;
  std::int64_t code;
  std::string problem;
};

void expectRefused(const std::vector<Case>& cases) {
  for (const Case& wrong : cases) {
    ChannelFileProblem problem;
    EXPECT_FALSE(ChannelFile::parse(wrong.text, problem)) << wrong.text;
    EXPECT_EQ(problem.code, wrong.code) << wrong.text;
    EXPECT_EQ(problem.text, wrong.problem);
  }
}

TEST(ChannelFileTest, ReadsASimpleAHistogramAndAStateChannel) {
  const auto records = recordsOf(R"({"driver": "Amp Drv<0x1>", "channels": [
    {"group": "Speaker", "name": "Rail Volts", "unit": "mV", "format": "simple", "value": 12},
    {"group": "Tx", "subgroup": "Queue", "name": "Delay", "unit": "us", "format": "histogram",
     "min": 1, "max": 90, "buckets": [{"lower": 0, "upper": 10, "hits": 5}]},
    {"group": "pdm", "name": "Mic", "format": "state",
     "states": [{"name": "on", "transitions": 1, "residency": 200, "duty_cycle": 0.5}]}]})");
  EXPECT_THAT(
      records,
      ElementsAre(
          ChanmeterRecord{.key = {.driver = kDriver, .group = "Speaker", .name = "Rail Volts"},
                          .unit = "mV",
                          .format = kChanmeterFormatSimple,
                          .value = 12},
          ChanmeterRecord{.key = {.driver = kDriver, .group = "Tx", .subGroup = "Queue", .name = "Delay"},
                          .unit = "us",
                          .format = kChanmeterFormatHistogram,
                          .minimum = 1,
                          .maximum = 90,
                          .buckets = {{0, 10, 5}}},
          ChanmeterRecord{.key = {.driver = kDriver, .group = "pdm", .name = "Mic"},
                          .format = kChanmeterFormatState,
                          .states = {{"on", 1, 200, 0.5}}}));
}

TEST(ChannelFileTest, TakesADriverWithoutChannels) { EXPECT_THAT(recordsOf(fileOf("")), IsEmpty()); }

TEST(ChannelFileTest, KnowsTheFormatsByName) {
  const auto formatOf = [](const std::string& format) {
    return recordsOf(fileOf(R"({"group": "g", "name": "n", "format": ")" + format + R"("})")).at(0).format;
  };
  EXPECT_EQ(formatOf("invalid"), kChanmeterFormatInvalid);
  EXPECT_EQ(formatOf("simple_array"), kChanmeterFormatSimpleArray);
  for (const char* unknown : {"vector", "Simple", "simple ", "", "1"}) {
    EXPECT_GT(formatOf(unknown), kChanmeterFormatSimpleArray) << unknown;
  }
}

TEST(ChannelFileTest, IgnoresFieldsThatAFormatDoesNotUse) {
  const auto records = recordsOf(fileOf(
      R"({"group": "g", "name": "n", "format": "vector", "value": [1, {}], "note": null, "min": "low"})"));
  EXPECT_THAT(records, SizeIs(1));
}

TEST(ChannelFileTest, TakesTheLastOfAFieldGivenTwice) {
  EXPECT_EQ(recordsOf(simpleOf(R"(1, "value": 2)")).at(0).value, 2);
}

TEST(ChannelFileTest, TakesEveryIntegerThatItsFieldCanHold) {
  EXPECT_EQ(recordsOf(simpleOf("9223372036854775807")).at(0).value, std::numeric_limits<std::int64_t>::max());
  EXPECT_EQ(recordsOf(simpleOf("-9223372036854775808")).at(0).value,
            std::numeric_limits<std::int64_t>::min());
  const auto state = recordsOf(
      statesOf(R"([{"name": "", "transitions": 18446744073709551615, "residency": 0, "duty_cycle": 1}])"));
  EXPECT_EQ(state.at(0).states.at(0).transitions, std::numeric_limits<std::uint64_t>::max());
  EXPECT_EQ(state.at(0).states.at(0).dutyCycle, 1.0);
}

TEST(ChannelFileTest, NamesThePlaceOfAnIntegerOutOfRange) {
  constexpr char kState[] = R"([{"name": "", "transitions": 0, "residency": )";
  expectRefused({
      {simpleOf("9223372036854775808"), kChannelsOutOfRange, "/channels/0/value is out of range"},
      {simpleOf("-9223372036854775809"), kChannelsOutOfRange, "/channels/0/value is out of range"},
      {simpleOf("123456789012345678901234567890"), kChannelsOutOfRange, "/channels/0/value is out of range"},
      {histogramOf(R"([{"lower": 0, "upper": 9223372036854775808, "hits": 1}])"), kChannelsOutOfRange,
       "/channels/0/buckets/0/upper is out of range"},
      {statesOf(kState + std::string("-1}]")), kChannelsOutOfRange,
       "/channels/0/states/0/residency is out of range"},
      {statesOf(kState + std::string("18446744073709551616}]")), kChannelsOutOfRange,
       "/channels/0/states/0/residency is out of range"},
      {simpleOf("1e999"), kChannelsOutOfRange, "a number is beyond what a double can hold"},
  });
}

TEST(ChannelFileTest, LeavesABucketWithoutABoundToItsReader) {
  const auto records = recordsOf(histogramOf(R"([{"upper": 10, "hits": 5}, {"lower": 10, "hits": 6}])"));
  EXPECT_THAT(records.at(0).buckets, ElementsAre(ChanmeterBucket{{}, 10, 5}, ChanmeterBucket{10, {}, 6}));
}

TEST(ChannelFileTest, NamesThePlaceOfAMissingField) {
  expectRefused({
      {R"({"channels": []})", kChannelsFieldMissing, "/driver is missing"},
      {R"({"driver": "d"})", kChannelsFieldMissing, "/channels is missing"},
      {fileOf(R"({"name": "n", "format": "simple", "value": 1})"), kChannelsFieldMissing,
       "/channels/0/group is missing"},
      {fileOf(R"({"group": "g", "format": "simple", "value": 1})"), kChannelsFieldMissing,
       "/channels/0/name is missing"},
      {fileOf(R"({"group": "g", "name": "n", "value": 1})"), kChannelsFieldMissing,
       "/channels/0/format is missing"},
      {fileOf(
           R"({"group": "g", "name": "n", "format": "invalid"}, {"group": "g", "name": "n", "format": "simple"})"),
       kChannelsFieldMissing, "/channels/1/value is missing"},
      {histogramOf("[]", R"("max": 1)"), kChannelsFieldMissing, "/channels/0/min is missing"},
      {histogramOf("[]", R"("min": 1)"), kChannelsFieldMissing, "/channels/0/max is missing"},
      {histogramOf(R"([{"lower": 1, "upper": 2}])"), kChannelsFieldMissing,
       "/channels/0/buckets/0/hits is missing"},
      {fileOf(R"({"group": "g", "name": "n", "format": "histogram", "min": 1, "max": 2})"),
       kChannelsFieldMissing, "/channels/0/buckets is missing"},
      {fileOf(R"({"group": "g", "name": "n", "format": "state"})"), kChannelsFieldMissing,
       "/channels/0/states is missing"},
      {statesOf(R"([{"transitions": 1, "residency": 1, "duty_cycle": 1}])"), kChannelsFieldMissing,
       "/channels/0/states/0/name is missing"},
      {statesOf(R"([{"name": "", "residency": 1, "duty_cycle": 1}])"), kChannelsFieldMissing,
       "/channels/0/states/0/transitions is missing"},
      {statesOf(R"([{"name": "", "transitions": 1, "duty_cycle": 1}])"), kChannelsFieldMissing,
       "/channels/0/states/0/residency is missing"},
      {statesOf(R"([{"name": "", "transitions": 1, "residency": 1}])"), kChannelsFieldMissing,
       "/channels/0/states/0/duty_cycle is missing"},
  });
}

TEST(ChannelFileTest, NamesThePlaceOfAWrongType) {
  expectRefused({
      {"[]", kChannelsWrongType, "the file is no object"},
      {"null", kChannelsWrongType, "the file is no object"},
      {R"({"driver": 7, "channels": []})", kChannelsWrongType, "/driver is no text"},
      {R"({"driver": "d", "channels": {}})", kChannelsWrongType, "/channels is no array"},
      {fileOf("7"), kChannelsWrongType, "/channels/0 is no object"},
      {fileOf(R"({"group": null, "name": "n", "format": "simple", "value": 1})"), kChannelsWrongType,
       "/channels/0/group is no text"},
      {fileOf(R"({"group": "g", "subgroup": 1, "name": "n", "format": "simple", "value": 1})"),
       kChannelsWrongType, "/channels/0/subgroup is no text"},
      {fileOf(R"({"group": "g", "name": [], "format": "simple", "value": 1})"), kChannelsWrongType,
       "/channels/0/name is no text"},
      {fileOf(R"({"group": "g", "name": "n", "unit": 1, "format": "simple", "value": 1})"),
       kChannelsWrongType, "/channels/0/unit is no text"},
      {fileOf(R"({"group": "g", "name": "n", "format": 1, "value": 1})"), kChannelsWrongType,
       "/channels/0/format is no text"},
      {simpleOf(R"("12")"), kChannelsWrongType, "/channels/0/value is no integer"},
      {simpleOf("1.5"), kChannelsWrongType, "/channels/0/value is no integer"},
      {simpleOf("1.0"), kChannelsWrongType, "/channels/0/value is no integer"},
      {simpleOf("true"), kChannelsWrongType, "/channels/0/value is no integer"},
      {histogramOf("{}"), kChannelsWrongType, "/channels/0/buckets is no array"},
      {histogramOf("[[]]"), kChannelsWrongType, "/channels/0/buckets/0 is no object"},
      {histogramOf(R"([{"lower": null, "upper": 2, "hits": 1}])"), kChannelsWrongType,
       "/channels/0/buckets/0/lower is no integer"},
      {statesOf(R"([{"name": "", "transitions": 1, "residency": 1, "duty_cycle": "1"}])"), kChannelsWrongType,
       "/channels/0/states/0/duty_cycle is no number"},
  });
}

TEST(ChannelFileTest, NamesLineAndColumnOfWhatIsNoJson) {
  const auto problemOf = [](const std::string& text) {
    ChannelFileProblem problem;
    EXPECT_FALSE(ChannelFile::parse(text, problem)) << text;
    EXPECT_EQ(problem.code, kChannelsNotJson);
    return problem.text;
  };
  EXPECT_THAT(problemOf(""), StartsWith("line 1, column 1: "));
  EXPECT_THAT(problemOf("{\"driver\":\n \"d\" 7"),
              AllOf(StartsWith("line 2, column 6: syntax error"), Not(HasSubstr("last read"))));
  EXPECT_THAT(problemOf(fileOf("") + "x"), StartsWith("line 1, column 43: "));
  EXPECT_THAT(problemOf(fileOf("\"\xff\"")), HasSubstr("UTF-8"));
  EXPECT_THAT(problemOf(fileOf("// none")), StartsWith("line 1, column "));
}

TEST(ChannelFileTest, ShortensTheProblemOfALongText) {
  ChannelFileProblem problem;
  EXPECT_FALSE(ChannelFile::parse("{\"" + std::string(1 << 19, 'x') + "\" 7", problem));
  EXPECT_LT(problem.text.size(), 200U);
}

TEST(ChannelFileTest, SurvivesDeepNesting) {
  ChannelFileProblem problem;
  EXPECT_FALSE(ChannelFile::parse(std::string(1 << 17, '['), problem));
  const std::string deep(20000, '[');
  const std::string closed(20000, ']');
  EXPECT_THAT(
      recordsOf(fileOf(R"({"group": "g", "name": "n", "format": "x", "value": )" + deep + closed + "}")),
      SizeIs(1));
}

}  // namespace
}  // namespace tonewerk
