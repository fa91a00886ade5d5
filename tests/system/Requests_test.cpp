// SPDX-License-Identifier: Apache-2.0
//
// Tests the requests end to end: which answers come, how often, in which order.
#include <string>
#include <vector>

#include "platform/linux/socket/RawClient.h"
#include "system/support/DaemonTest.h"
#include "system/support/Packed.h"

namespace tonewerk {
namespace {

using packed::integer;
using packed::request;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

constexpr ReporterID kSession = 77;
constexpr AudioServiceType kLongFormAudio = 7;
const std::string kStart = "startReportingSessionForID";
const std::string kStop = "stopReportingSessionForID";

class RequestsTest : public RunningDaemonTest {
 protected:
  // The identifiers of the answers, up to the answer to request `last`.
  static std::vector<std::uint32_t> answersUpTo(RawClient& client, std::uint32_t last) {
    std::vector<std::uint32_t> identifiers;
    while (identifiers.empty() || identifiers.back() != last) {
      const auto answer = client.response();
      if (!answer) break;
      EXPECT_FALSE(answer->error) << answer->error->text();
      identifiers.push_back(answer->identifier);
    }
    return identifiers;
  }
};

TEST_F(RequestsTest, AStartIsAnsweredAtTheStopBeforeTheStopItself) {
  DaemonClient client = connect();
  client.create(kSession, kLongFormAudio);
  client.start(kSession);
  EXPECT_THAT(client.answered(), IsEmpty());
  client.request(kStop, {Value(kSession)});
  ASSERT_TRUE(client.waitForAnswers(2));
  EXPECT_THAT(client.answered(), ElementsAre(kStart, kStop));
}

TEST_F(RequestsTest, ASecondStartIsNeverAnswered) {
  RawClient client(daemon.socketPath());
  client.send(request(1, "createReportingSession", {integer(kSession)}) +
              request(2, kStart, {integer(kSession)}) + request(3, kStart, {integer(kSession)}) +
              request(4, kStop, {integer(kSession)}) + request(5, "getAllReporters", {}));
  EXPECT_THAT(answersUpTo(client, 5), ElementsAre(1, 2, 4, 5));
}

TEST_F(RequestsTest, ASessionCanBeStartedAgainAfterItsStop) {
  RawClient client(daemon.socketPath());
  client.send(request(1, "createReportingSession", {integer(kSession)}));
  client.send(request(2, kStart, {integer(kSession)}) + request(3, kStop, {integer(kSession)}));
  client.send(request(4, kStart, {integer(kSession)}) + request(5, kStop, {integer(kSession)}));
  client.send(request(6, kStop, {integer(kSession)}));
  EXPECT_THAT(answersUpTo(client, 6), ElementsAre(1, 2, 3, 4, 5, 6));
}

TEST_F(RequestsTest, StartsOfNothingAreAnsweredAtOnce) {
  RawClient client(daemon.socketPath());
  client.send(request(1, kStart, {integer(0)}) + request(2, kStart, {integer(kSession)}));
  EXPECT_THAT(answersUpTo(client, 2), ElementsAre(1, 2));
}

TEST_F(RequestsTest, AStartIsLeftUnansweredWhenItsSessionIsDestroyed) {
  RawClient client(daemon.socketPath());
  client.send(request(1, "createReportingSession", {integer(kSession)}) +
              request(2, kStart, {integer(kSession)}) +
              request(3, "destroyReportingSession", {integer(kSession)}) + request(4, "getAllReporters", {}));
  EXPECT_THAT(answersUpTo(client, 4), ElementsAre(1, 3, 4));
}

TEST_F(RequestsTest, TheServiceTypeOfSessionZeroIsAnsweredTwice) {
  RawClient client(daemon.socketPath());
  client.send(request(8, "getServiceNameForReporterID", {integer(0)}) + request(9, "getAllReporters", {}));
  for (int at = 0; at < 2; ++at) {
    const auto answer = client.response();
    ASSERT_TRUE(answer);
    EXPECT_EQ(answer->identifier, 8U);
    EXPECT_EQ(answer->result, Value(65'535));
  }
  EXPECT_THAT(answersUpTo(client, 9), ElementsAre(9));
}

TEST_F(RequestsTest, NotificationsAreCarriedOutAndNeverAnswered) {
  RawClient client(daemon.socketPath());
  client.send(packed::notification("createReportingSession", {integer(kSession)}) +
              packed::notification("setServiceType", {integer(3), integer(kSession)}) +
              packed::notification(kStart, {integer(kSession)}) +
              packed::notification(kStop, {integer(kSession)}) +
              packed::notification("getServiceNameForReporterID", {integer(0)}) +
              request(4'294'967'295, "getServiceNameForReporterID", {integer(kSession)}));
  const auto answer = client.response();
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->identifier, 4'294'967'295U);
  EXPECT_EQ(answer->result, Value(3));
}

TEST_F(RequestsTest, RequestsForUnknownSessionsSucceedAndDoNothing) {
  DaemonClient client = connect();
  for (const ReporterID reporterID : {ReporterID{0}, kSession}) {
    EXPECT_EQ(client.call("setServiceType", {Value(3), Value(reporterID)}).result, Value(true));
    client.setConfiguration(reporterID, {{"a", 1}});
    client.send({{"a", 1}}, 1, 0, {reporterID});
    client.stop(reporterID);
    client.destroy(reporterID);
    EXPECT_EQ(client.call("reporterIDValid", {Value(reporterID)}).result,
              Value(ValueMap{{"reporterID", 0}, {"serviceType", 65'535}}));
  }
  EXPECT_THAT(client.allReporters(), IsEmpty());
}

TEST_F(RequestsTest, ASessionIsSeenByAllClientsAndChangedByItsOwn) {
  DaemonClient owner = connect();
  DaemonClient other = connect();
  owner.create(kSession, kLongFormAudio);
  other.create(5, 3);
  EXPECT_THAT(owner.allReporters(), UnorderedElementsAre(kSession, 5));
  EXPECT_EQ(other.serviceType(kSession), kLongFormAudio);
  EXPECT_EQ(other.call("reporterIDValid", {Value(kSession)}).result,
            Value(ValueMap{{"reporterID", kSession}, {"serviceType", kLongFormAudio}}));

  EXPECT_EQ(other.call("setServiceType", {Value(3), Value(kSession)}).result, Value(true));
  other.destroy(kSession);
  other.stop(kSession);
  EXPECT_EQ(owner.serviceType(kSession), kLongFormAudio);

  // The same identifier on two connections means two sessions; that of the older connection is found first.
  other.create(kSession, 3);
  EXPECT_EQ(other.serviceType(kSession), 3);
  DaemonClient third = connect();
  EXPECT_EQ(third.serviceType(kSession), kLongFormAudio);
}

TEST_F(RequestsTest, AnotherServiceTypeMakesAnotherSessionThatIsNotStarted) {
  RawClient client(daemon.socketPath());
  client.send(
      request(1, "createReportingSession", {integer(kSession)}) + request(2, kStart, {integer(kSession)}) +
      request(3, "setServiceType", {integer(3), integer(kSession)}) + request(4, kStop, {integer(kSession)}) +
      request(5, kStart, {integer(kSession)}) +
      request(6, "setServiceType", {integer(3), integer(kSession)}) + request(7, kStop, {integer(kSession)}));
  // The session of the first start is gone. Setting the same type again changes nothing.
  EXPECT_THAT(answersUpTo(client, 7), ElementsAre(1, 3, 4, 6, 5, 7));
}

TEST_F(RequestsTest, AClientsSessionsGoWithIt) {
  DaemonClient leaving = connect();
  DaemonClient staying = connect();
  leaving.create(kSession, kLongFormAudio);
  leaving.create(5);
  leaving.start(kSession);
  staying.create(6);
  leaving.disconnect();
  EXPECT_TRUE(waitUntil([&] { return staying.allReporters() == std::vector<ReporterID>{6}; }));
}

class InternalBuildRequestsTest : public RequestsTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
    RequestsTest::SetUp();
  }
};

TEST_F(InternalBuildRequestsTest, AStartOfATestSessionIsAnsweredAtOnceAndAtItsStop) {
  RawClient client(daemon.socketPath());
  client.send(request(1, "createReportingSession", {integer(kSession)}) +
              request(2, "setServiceType", {integer(11), integer(kSession)}) +
              request(3, kStart, {integer(kSession)}) + request(4, "getAllReporters", {}) +
              request(5, kStop, {integer(kSession)}));
  EXPECT_THAT(answersUpTo(client, 5), ElementsAre(1, 2, 3, 4, 3, 5));
}

TEST_F(InternalBuildRequestsTest, AStartOfAnyOtherSessionIsAnsweredOnce) {
  RawClient client(daemon.socketPath());
  client.send(request(1, "createReportingSession", {integer(kSession)}) +
              request(2, "setServiceType", {integer(7), integer(kSession)}) +
              request(3, kStart, {integer(kSession)}) + request(4, "getAllReporters", {}) +
              request(5, kStop, {integer(kSession)}));
  EXPECT_THAT(answersUpTo(client, 5), ElementsAre(1, 2, 4, 3, 5));
}

}  // namespace
}  // namespace tonewerk
