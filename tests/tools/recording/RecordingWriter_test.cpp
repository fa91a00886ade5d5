// SPDX-License-Identifier: Apache-2.0
#include "tools/recording/RecordingWriter.h"

#include <gmock/gmock.h>
#include <rapidcheck/gtest.h>
#include <sstream>
#include <string>

#include "platform/linux/json/NlohmannJsonService.h"
#include "protocol/Requests.h"
#include "support/ValueGenerators.h"
#include "tools/recording/RecordedValues.h"
#include "tools/recording/Recording.h"

namespace tonewerk {
namespace {

using testing::SizeIs;

constexpr double kTime = 1'763'633'880.25;

class RecordingWriterTest : public testing::Test {
 protected:
  std::optional<Recording> read() {
    std::istringstream text(out_.str());
    return Recording::read(text, requests::all(), json_, problem_);
  }

  NlohmannJsonService json_;
  std::ostringstream out_;
  std::string problem_;
};

TEST_F(RecordingWriterTest, WritesARecordingThatAReplayReads) {
  RecordingWriter writer(out_, json_, {{"user", 995}});
  writer.call(kTime, {2, 1001, "player"}, "createReportingSession", {7});
  writer.call(kTime + 0.5, {2, 1001, "player"}, "sendMessage", {ValueMap{{"a", 1}}, 4, 1, std::nullopt});
  writer.call(kTime + 1.0, {3, kNoUser}, "getAllReporters", {});
  writer.disconnect(kTime + 2.0, 2);
  EXPECT_TRUE(writer.finish());
  EXPECT_EQ(out_.str(), R"({"device":{"user":995,"starts_at":1763633880.25}}
{"at":0.0,"client":2,"connect":{"user":1001,"process":"player"}}
{"at":0.0,"client":2,"call":"createReportingSession","params":[7]}
{"at":0.5,"client":2,"call":"sendMessage","params":[{"a":1},4,1,null]}
{"at":1.0,"client":3,"connect":{}}
{"at":1.0,"client":3,"call":"getAllReporters","params":[]}
{"at":2.0,"client":2,"disconnect":true}
)");
  const auto recording = read();
  ASSERT_TRUE(recording) << problem_;
  EXPECT_THAT(recording->steps(), SizeIs(7));
  EXPECT_EQ(recording->requests(), 3U);
}

TEST_F(RecordingWriterTest, ConnectsAClientAgainThatComesBack) {
  RecordingWriter writer(out_, json_, {});
  writer.disconnect(kTime, 2);  // was never there
  writer.call(kTime, {2, 1001}, "getAllReporters", {});
  writer.disconnect(kTime, 2);
  writer.call(kTime, {2, 1002}, "getAllReporters", {});
  const auto recording = read();
  ASSERT_TRUE(recording) << problem_;
  ASSERT_THAT(recording->steps(), SizeIs(6));
  EXPECT_EQ(recording->steps()[4].properties, ValueMap({{"user", 1002}}));
}

TEST_F(RecordingWriterTest, ClientsConnectAgainAfterARestart) {
  RecordingWriter writer(out_, json_, {});
  writer.restart(kTime);
  EXPECT_EQ(out_.str(), "");
  writer.call(kTime, {2, 1001}, "getAllReporters", {});
  writer.restart(kTime + 1.0);
  writer.disconnect(kTime + 1.0, 2);
  writer.call(kTime + 2.0, {2, 1001}, "getAllReporters", {});
  const auto recording = read();
  ASSERT_TRUE(recording) << problem_;
  ASSERT_THAT(recording->steps(), SizeIs(6));
  EXPECT_EQ(recording->steps()[3].kind, RecordedStep::Kind::kRestart);
  EXPECT_EQ(recording->steps()[3].at, 1.0);
  EXPECT_EQ(recording->steps()[4].kind, RecordedStep::Kind::kConnect);
}

TEST_F(RecordingWriterTest, GoesOnUntilATimeWithoutARequest) {
  RecordingWriter writer(out_, json_, {});
  writer.reach(kTime);
  EXPECT_EQ(out_.str(), "");
  writer.call(kTime, {2, 1001}, "getAllReporters", {});
  writer.reach(kTime + 5.5);
  writer.reach(kTime + 5.5);
  writer.reach(kTime);
  const auto recording = read();
  ASSERT_TRUE(recording) << problem_;
  ASSERT_THAT(recording->steps(), SizeIs(4));
  EXPECT_EQ(recording->steps()[3].at, 5.5);
}

TEST_F(RecordingWriterTest, KeepsTheOrderWhenTheClockGoesBack) {
  RecordingWriter writer(out_, json_, {});
  for (const double offset : {0.0, 5.0, -100.0, 6.0}) {
    writer.call(kTime + offset, {2, 1001}, "getAllReporters", {});
  }
  const auto recording = read();
  ASSERT_TRUE(recording) << problem_;
  ASSERT_THAT(recording->steps(), SizeIs(6));
  EXPECT_EQ(recording->steps()[4].at, 5.0);
  EXPECT_EQ(recording->steps()[5].at, 6.0);
}

TEST_F(RecordingWriterTest, SaysWhenItCannotWrite) {
  RecordingWriter writer(out_, json_, {});
  out_.setstate(std::ios::badbit);
  writer.call(kTime, {2, 1001}, "getAllReporters", {});
  EXPECT_FALSE(writer.finish());
}

// To the bit: a message without a time gets that of its arrival.
RC_GTEST_FIXTURE_PROP(RecordingWriterTest, APlayedRequestHasTheTimeAtWhichItCame, ()) {
  out_.str({});
  const double time = 1.7e9 + static_cast<double>(*rc::gen::inRange<std::int64_t>(0, 1'000'000'000)) / 1e6;
  const double later = time + static_cast<double>(*rc::gen::inRange<std::int64_t>(0, 1'000'000'000)) / 1e3;
  RecordingWriter writer(out_, json_, {});
  writer.call(time, {2, 1001}, "getAllReporters", {});
  writer.call(later, {2, 1001}, "getAllReporters", {});
  const auto recording = read();
  RC_ASSERT(recording.has_value());
  RC_ASSERT(recording->steps()[0].properties.find("starts_at")->number() == time);
  RC_ASSERT(time + recording->steps()[3].at == later);
}

RC_GTEST_FIXTURE_PROP(RecordingWriterTest, APlayedMessageIsTheOneThatCame, ()) {
  out_.str({});
  const ValueMap message = *generate::map();
  RecordingWriter writer(out_, json_, {});
  writer.call(kTime, {2, 1001}, "sendMessage", {message, 4, 1, ValueArray{7}});
  const auto recording = read();
  RC_ASSERT(recording.has_value());
  const Arguments played = recording->steps()[2].parametersAt(kTime);
  RC_ASSERT(*played[0] == Value(message));
  RC_ASSERT(played[0]->text() == Value(message).text());
}

// Each would otherwise stand for something else.
TEST_F(RecordingWriterTest, KeepsMapsThatLookLikeOtherValues) {
  for (const ValueMap& map : {ValueMap{{"now", 1}}, ValueMap{{"date", 2.5}}, ValueMap{{"number", "nan"}},
                              ValueMap{{"map", ValueMap()}}, ValueMap{{"map", ValueMap{{"now", 1}}}},
                              ValueMap{{"now", Date{5}}}, ValueMap{{"date", "inf"}}}) {
    EXPECT_EQ(playedValue(recordedValue(map), kTime), Value(map)) << map.text();
    EXPECT_NE(recordedValue(map), Value(map)) << map.text();
  }
}

TEST_F(RecordingWriterTest, LeavesMapsThatStandForThemselvesAsTheyAre) {
  for (const ValueMap& map :
       {ValueMap(), ValueMap{{"now", "x"}}, ValueMap{{"number", 1}}, ValueMap{{"map", 1}},
        ValueMap{{"date", "today"}}, ValueMap{{"now", 1}, {"date", 1}}}) {
    EXPECT_EQ(recordedValue(map), Value(map)) << map.text();
    EXPECT_EQ(playedValue(map, kTime), Value(map)) << map.text();
  }
}

}  // namespace
}  // namespace tonewerk
