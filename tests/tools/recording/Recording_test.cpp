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
  ASSERT_THAT(recording->calls(), SizeIs(2));
  const RecordedCall& call = recording->calls()[1];
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
  const Arguments sent = recording->calls()[0].parametersAt(100.0);
  EXPECT_EQ(sent[0], Value(ValueMap{{"t", 98.5},
                                    {"l", ValueArray{102.0}},
                                    {"m", ValueMap{{"now", 0}, {"x", 1}}},
                                    {"s", ValueMap{{"now", "x"}}}}));
  EXPECT_NE(sent[0]->asMap()->find("t")->asDouble(), nullptr);
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

}  // namespace
}  // namespace tonewerk
