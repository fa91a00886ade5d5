// SPDX-License-Identifier: Apache-2.0
#include "tools/journal/JournalRecorder.h"

#include <gmock/gmock.h>
#include <sstream>
#include <string>

#include "platform/JournalProcess.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"
#include "tools/recording/Recording.h"

namespace tonewerk {
namespace {

using Kind = Journal::Kind;

constexpr double kBegin = 1'763'633'880.25;

class JournalRecorderTest : public testing::Test {
 protected:
  void take(Kind kind, double at, std::uint64_t client, const std::string& bytes = {}) {
    recorder.take({++sequence, kind, {kBegin + at, client, 1001}, bytes});
  }
  void connect(double at, std::uint64_t client = 0, const std::optional<std::string>& name = "player") {
    take(Kind::kConnected, at, client, encoded(JournalProcess{11, name}));
  }
  void call(double at, std::uint64_t client, std::string_view method, const Arguments& arguments) {
    std::string frame;
    RpcWriter(frame).notification(method, arguments);
    take(Kind::kRequest, at, client, frame);
  }
  // Without the first line. It must be a recording.
  std::string lines() {
    EXPECT_TRUE(writer.finish());
    std::istringstream text(out.str());
    std::string problem;
    EXPECT_TRUE(Recording::read(text, requests::all(), json, problem)) << problem;
    return out.str().substr(std::min(out.str().find('\n'), out.str().size() - 1) + 1);
  }

  NlohmannJsonService json;
  std::ostringstream out;
  RecordingWriter writer{out, json, {}};
  JournalRecorder recorder{writer, SessionChoice({}, 500)};
  std::uint64_t sequence = 0;
};

TEST_F(JournalRecorderTest, ARecordBecomesALineWithItsTime) {
  connect(0);
  call(0.5, 1, "createReportingSession", {77});
  connect(0.5, 1);  // again, before another session
  call(1.0, 1, "sendMessage", {ValueMap{{"a", 1.5}}, 4, 1, std::nullopt});
  take(Kind::kSingleMessagesEnded, 1.5, 0);
  take(Kind::kDisconnected, 2.0, 1);
  EXPECT_EQ(lines(), R"({"at":0.0,"client":1,"connect":{"user":1001,"process":"player"}}
{"at":0.0,"client":1,"call":"createReportingSession","params":[77]}
{"at":0.5,"client":1,"call":"sendMessage","params":[{"a":1.5},4,1,null]}
{"at":1.0,"device":{}}
{"at":1.5,"client":1,"disconnect":true}
)");
  EXPECT_EQ(out.str().substr(0, out.str().find('\n')), R"({"device":{"starts_at":1763633880.75}})");
  EXPECT_EQ(recorder.requests(), 2U);
  EXPECT_EQ(recorder.sessions(), 1U);
  EXPECT_EQ(recorder.withoutClient(), 0U);
}

TEST_F(JournalRecorderTest, AProcessEndsAtItsLastRecord) {
  recorder.endProcess();
  connect(0);
  connect(0, 0, std::nullopt);
  call(0, 2, "createReportingSession", {78});
  connect(3.0);  // without a request; the last record
  recorder.endProcess();
  call(4.0, 2, "createReportingSession", {79});
  EXPECT_EQ(lines(), R"({"at":0.0,"client":2,"connect":{"user":1001}}
{"at":0.0,"client":2,"call":"createReportingSession","params":[78]}
{"at":3.0,"restart":true}
)");
  EXPECT_EQ(recorder.withoutClient(), 1U) << "the clients of the process are gone";
}

TEST_F(JournalRecorderTest, TheRecordingEndsWithTheLastRecord) {
  connect(0);
  call(0, 1, "createReportingSession", {77});
  connect(3.0);
  recorder.end();
  EXPECT_THAT(lines(), testing::EndsWith("\n{\"at\":3.0,\"device\":{}}\n"));
}

TEST_F(JournalRecorderTest, RequestsOfAClientThatIsNotKnownAreLeftOutAndCounted) {
  call(0, 1, "startReportingSessionForID", {77});
  take(Kind::kDisconnected, 1.0, 1);
  sequence = 9;
  connect(2.0);
  take(Kind::kConnected, 2.0, 0, "no process");
  call(2.0, 11, "createReportingSession", {77});
  call(2.0, 10, "createReportingSession", {77});
  EXPECT_EQ(recorder.requests(), 1U);
  EXPECT_EQ(recorder.withoutClient(), 2U);
  EXPECT_THAT(lines(), testing::StartsWith(R"({"at":0.0,"client":10,"connect")"));
}

TEST_F(JournalRecorderTest, BytesThatAreNoRequestAreLeftOut) {
  connect(0);
  call(0, 1, "nothing", {77});
  call(0, 1, "createReportingSession", {"seven"});
  take(Kind::kRequest, 0, 1, "no frame");
  take(Kind::kRequest, 0, 1);
  call(0, 1, "createReportingSession", {7});
  EXPECT_EQ(recorder.requests(), 1U);
}

TEST_F(JournalRecorderTest, OfOneSessionThereAreItsClientAndItsRequests) {
  JournalRecorder one(writer, SessionChoice({.session = 77}, 500));
  const auto frameOf = [](std::string_view method, const Arguments& arguments) {
    std::string frame;
    RpcWriter(frame).notification(method, arguments);
    return frame;
  };
  const std::string process = encoded(JournalProcess{11, "player"});
  one.take({1, Kind::kConnected, {kBegin, 0, 1001}, process});
  one.take({2, Kind::kConnected, {kBegin, 0, 1001}, process});
  one.take({3, Kind::kRequest, {kBegin, 1, 1001}, frameOf("createReportingSession", {76})});
  one.take({4, Kind::kRequest, {kBegin + 1.0, 2, 1001}, frameOf("createReportingSession", {77})});
  one.take({5, Kind::kSingleMessagesEnded, {kBegin + 2.0, 0, 1001}, {}});
  one.take({6, Kind::kRequest, {kBegin + 3.0, 1, 1001}, frameOf("destroyReportingSession", {76})});
  one.end();
  EXPECT_EQ(lines(), R"({"at":0.0,"client":2,"connect":{"user":1001,"process":"player"}}
{"at":0.0,"client":2,"call":"createReportingSession","params":[77]}
{"at":2.0,"device":{}}
)");
  EXPECT_EQ(one.requests(), 1U);
  EXPECT_EQ(one.sessions(), 1U);
}

}  // namespace
}  // namespace tonewerk
