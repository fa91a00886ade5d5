// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/Recording.h"

#include <gmock/gmock.h>
#include <sstream>
#include <string>

#include "protocol/Requests.h"
#include "support/memory/MemoryJsonService.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::HasSubstr;
using testing::SizeIs;
using testing::StartsWith;

class RecordingTest : public testing::Test {
 protected:
  std::optional<Recording> read(const std::string& text) {
    std::istringstream stream(text);
    return Recording::read(stream, requests::all(), json_, problem_);
  }
  std::string problemOf(const std::string& text) {
    problem_.clear();
    EXPECT_FALSE(read(text)) << text;
    return problem_;
  }

  MemoryJsonService json_;
  std::string problem_;
};

TEST_F(RecordingTest, HoldsRequestsWithTheirTimesAndLines) {
  const auto recording = read(R"({"at": 0, "call": "createReportingSession", "params": [7]}

{"at": 1.5, "call": "sendMessage", "params": [{"a": [1, "b"]}, 4, 1, null]}
)");
  ASSERT_TRUE(recording) << problem_;
  ASSERT_THAT(recording->steps(), SizeIs(2));
  const RecordedStep& call = recording->steps()[1];
  EXPECT_EQ(call.line, 3U);
  EXPECT_EQ(call.at, 1.5);
  EXPECT_EQ(call.method, "sendMessage");
  ASSERT_THAT(call.parameters, SizeIs(4));
  EXPECT_EQ(call.parameters[0], Value(ValueMap{{"a", ValueArray{1, "b"}}}));
  EXPECT_FALSE(call.parameters[3]);
}

TEST_F(RecordingTest, PutsTheTimeOfSendingInPlace) {
  const auto recording = read(
      R"({"at": 0, "call": "sendMessage", "params": [{"t": {"now": -1.5}, "l": [{"now": 2}], "m": {"now": 0, "x": 1},)"
      R"( "s": {"now": "x"}}, 4, 1, null]})");
  ASSERT_TRUE(recording) << problem_;
  const Arguments sent = recording->steps()[0].parametersAt(100.0);
  EXPECT_EQ(sent[0], Value(ValueMap{{"t", 98.5},
                                    {"l", ValueArray{102.0}},
                                    {"m", ValueMap{{"now", 0}, {"x", 1}}},
                                    {"s", ValueMap{{"now", "x"}}}}));
  EXPECT_NE(sent[0]->asMap()->find("t")->asDouble(), nullptr);
}

TEST_F(RecordingTest, HoldsClientsThatComeAndGo) {
  const auto recording = read(R"({"at": 0, "client": 2, "connect": {"user": 1001, "process": "player"}}
{"at": 1, "client": 2, "call": "getAllReporters", "params": []}
{"at": 1, "call": "getAllReporters", "params": []}
{"at": 2, "client": 2, "disconnect": true}
{"at": 3, "client": 2, "call": "getAllReporters", "params": []}
)");
  ASSERT_TRUE(recording) << problem_;
  const auto& steps = recording->steps();
  ASSERT_THAT(steps, SizeIs(5));
  EXPECT_EQ(steps[0].kind, RecordedStep::Kind::kConnect);
  EXPECT_EQ(steps[0].properties, ValueMap({{"user", 1001}, {"process", "player"}}));
  EXPECT_EQ(steps[1].client, 2);
  EXPECT_EQ(steps[2].client, RecordedStep::kFirstClient);
  EXPECT_EQ(steps[3].kind, RecordedStep::Kind::kDisconnect);
  EXPECT_EQ(recording->requests(), 3U);
}

TEST_F(RecordingTest, NobodyIsConnectedAfterARestart) {
  const std::string one = "{\"at\": 0, \"client\": 2, \"connect\": {}}\n";
  const std::string restart = "{\"at\": 1, \"restart\": true}\n";
  const auto recording = read(one + restart + "{\"at\": 2, \"client\": 2, \"connect\": {}}\n");
  ASSERT_TRUE(recording) << problem_;
  ASSERT_THAT(recording->steps(), SizeIs(3));
  EXPECT_EQ(recording->steps()[1].kind, RecordedStep::Kind::kRestart);
  EXPECT_EQ(recording->requests(), 0U);
  EXPECT_THAT(problemOf(one + restart + "{\"at\": 1, \"client\": 2, \"disconnect\": true}"),
              HasSubstr("line 3: client 2 is not connected"));
  EXPECT_THAT(problemOf("{\"at\": 1, \"restart\": 1}"), HasSubstr("\"restart\" must be true"));
  EXPECT_THAT(problemOf("{\"restart\": true}"), HasSubstr("\"at\""));
  EXPECT_THAT(problemOf("{\"at\": 1, \"client\": 2, \"restart\": true}"), HasSubstr("a restart has no"));
}

TEST_F(RecordingTest, HoldsWhatTheDeviceIsLikeFromALineOn) {
  const auto recording = read(
      R"({"device": {"starts_at": 1763633880, "facts": {"InternalBuild": true}, "user": 0, "uptime": 12.5}}
{"at": 2, "call": "getAllReporters", "params": []}
{"device": {"thermal_level": 3, "low_power_mode": true, "load_averages": [1, 0.5, 0]}}
{"at": 4, "device": {"notifications": {"com.orvane.x": 18446744073709551615}, "preferences": {"d": {"k": 1}}}}
{"at": 5, "device": {"channels": [{"driver": "d", "channels": []}]}}
)");
  ASSERT_TRUE(recording) << problem_;
  const auto& steps = recording->steps();
  ASSERT_THAT(steps, SizeIs(5));
  EXPECT_EQ(steps[2].kind, RecordedStep::Kind::kDevice);
  EXPECT_EQ(steps[2].at, 2.0);
  EXPECT_EQ(steps[3].at, 4.0);
  EXPECT_EQ(recording->requests(), 1U);
}

TEST_F(RecordingTest, NamesWhatIsWrongWithAClientOrTheDevice) {
  const std::string one = "{\"at\": 0, \"client\": 1, \"connect\": {}}\n";
  EXPECT_THAT(problemOf(one + one), HasSubstr("line 2: client 1 is connected already"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"disconnect\": true}"), HasSubstr("client 1 is not connected"));
  EXPECT_THAT(problemOf(one + "{\"at\": 0, \"disconnect\": false}"), HasSubstr("must be true"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"client\": -1, \"connect\": {}}"), HasSubstr("an integer from 0"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"connect\": {\"user\": -1}}"), HasSubstr("a user's number"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"connect\": {\"user\": 4294967295}}"), HasSubstr("a user's number"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"connect\": {\"pid\": 1}}"), HasSubstr("a client has no \"pid\""));
  EXPECT_THAT(problemOf("{\"at\": 0, \"connect\": 1}"), HasSubstr("must be an object"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"connect\": {}, \"params\": []}"), HasSubstr("only a call"));
  EXPECT_THAT(problemOf("{\"at\": 0, \"connect\": {}, \"disconnect\": true}"), HasSubstr("only one of"));
  EXPECT_THAT(problemOf("{\"device\": {}, \"client\": 1}"), HasSubstr("a device has no \"client\""));
  EXPECT_THAT(problemOf("{\"device\": {\"name\": 1}}"), HasSubstr("a device has no \"name\""));
  EXPECT_THAT(problemOf(one + "{\"device\": {\"starts_at\": 1}}"), HasSubstr("in the first line"));
  for (const char* property :
       {"\"starts_at\": -1", "\"uptime\": \"long\"", "\"facts\": {\"a\": 1}", "\"thermal_level\": 4",
        "\"low_power_mode\": 1", "\"load_averages\": [1, 2]", "\"preferences\": {\"a\": 1}",
        "\"notifications\": {\"a\": -1}", "\"channels\": [1]", "\"user\": \"root\""}) {
    EXPECT_THAT(problemOf("{\"device\": {" + std::string(property) + "}}"), HasSubstr("must be")) << property;
  }
}

TEST_F(RecordingTest, MayBeEmpty) { EXPECT_TRUE(read("\n")); }

TEST_F(RecordingTest, NamesTheLineAndWhatIsWrongWithIt) {
  const std::string good = "{\"at\": 5, \"call\": \"getAllReporters\", \"params\": []}\n";
  EXPECT_THAT(problemOf(good + "{"), StartsWith("line 2: "));
  EXPECT_THAT(problemOf("[]"), StartsWith("line 1: not a JSON object"));
  EXPECT_THAT(problemOf(good + "\n{\"at\": 5, \"call\": \"frob\", \"params\": []}"),
              AllOf(StartsWith("line 3: "), HasSubstr("no request \"frob\"")));
  EXPECT_THAT(problemOf("{\"at\": 5, \"params\": []}"), HasSubstr("\"call\""));
  EXPECT_THAT(problemOf("{\"call\": \"getAllReporters\", \"params\": []}"), HasSubstr("\"at\""));
  EXPECT_THAT(problemOf("{\"at\": -1, \"call\": \"getAllReporters\", \"params\": []}"), HasSubstr("\"at\""));
  EXPECT_THAT(problemOf("{\"at\": \"1\", \"call\": \"getAllReporters\", \"params\": []}"),
              HasSubstr("\"at\""));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"getAllReporters\"}"),
              HasSubstr("\"params\" must be an array"));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"getAllReporters\", \"params\": [], \"x\": 1}"),
              HasSubstr("unknown member \"x\""));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"getAllReporters\", \"params\": [1]}"),
              HasSubstr("takes 0 arguments"));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"reporterIDValid\", \"params\": [1.5]}"),
              HasSubstr("argument 1"));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"reporterIDValid\", \"params\": [null]}"),
              HasSubstr("argument 1"));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"sendMessage\", \"params\": [{\"a\": null}, 1, 1, null]}"),
              HasSubstr("parameter 1"));
  EXPECT_THAT(problemOf("{\"at\": 1, \"call\": \"sendMessage\", \"params\": [{\"now\": 1}, 1, 1, null]}"),
              HasSubstr("argument 1"));
  EXPECT_THAT(problemOf(good + "{\"at\": 4, \"call\": \"getAllReporters\", \"params\": []}"),
              HasSubstr("goes back, from 5 to 4"));
}

// Such a time did not fit into a clock's nanoseconds.
TEST_F(RecordingTest, RefusesTimesThatNoClockHas) {
  const auto call = [](const std::string& at) {
    return "{\"at\": " + at + ", \"call\": \"getAllReporters\", \"params\": []}\n";
  };
  EXPECT_TRUE(read(call("1e9"))) << problem_;
  for (const char* at : {"1000000000.5", "1e12", "1e300", "18446744073709551615"}) {
    EXPECT_THAT(problemOf(call(at)),
                HasSubstr("line 1: \"at\" must be a number of seconds from 0 to 1000000000"));
  }
}

TEST_F(RecordingTest, RefusesTimesAfterTheYear9999) {
  const std::string late = "{\"device\": {\"starts_at\": 253402300000}}\n";
  const auto call = [](const std::string& at) {
    return "{\"at\": " + at + ", \"call\": \"getAllReporters\", \"params\": []}\n";
  };
  EXPECT_TRUE(read(late + call("799"))) << problem_;
  EXPECT_THAT(problemOf(late + call("799.5")), HasSubstr("line 2: \"at\" is after the year 9999"));
  EXPECT_THAT(problemOf("{\"at\": 800, \"device\": {\"starts_at\": 253402300000}}\n"),
              HasSubstr("line 1: \"at\" is after the year 9999"));
}

// Writing such a value exhausted the stack.
TEST_F(RecordingTest, RefusesALineThatNestsTooDeep) {
  constexpr std::size_t kDeep = 500'000;
  const std::string deep = std::string(kDeep, '[') + std::string(kDeep, ']');
  EXPECT_EQ(problemOf("{\"at\": 1, \"call\": \"getAllReporters\", \"params\": [" + deep + "]}"),
            "line 1: values are nested deeper than 200");
}

}  // namespace
}  // namespace tonewerk
