// SPDX-License-Identifier: Apache-2.0
//
// Tests that the requests of one user reach the sessions of no other user, and that those of trusted users
// reach all.
#include <map>
#include <string>
#include <vector>

#include "support/OtherUser.h"
#include "system/support/RecordedEvents.h"
#include "system/support/UsersTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr std::int64_t kNotPermitted = 4;
constexpr AudioServiceType kNoService = 65'535;
constexpr AudioServiceType kTelephony = 2;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
const std::string kAsTelephony = "com.orvane.telephony.Playback.Start";
const std::string kAsLongFormAudio = "com.orvane.longformaudio.Playback.Start";

class SeparationTest : public UsersTest {
 protected:
  DaemonClient withSession(std::uint32_t user, ReporterID reporterID, AudioServiceType service) {
    DaemonClient client = connectAs(user);
    client.create(reporterID, service);
    client.start(reporterID);
    return client;
  }
  static void send(DaemonClient& client, int number, const std::vector<ReporterID>& reporterIDs) {
    client.send({{"number", number}}, kPlayback, kTypeStart, reporterIDs);
  }
  static std::int64_t validIdentifier(DaemonClient& client, ReporterID reporterID) {
    const Answer answer = client.call("reporterIDValid", {Value(reporterID)});
    return answer.result && answer.result->asMap() ? answer.result->asMap()->integer("reporterID") : -1;
  }

  // The numbers that were recorded under this name, after the daemon's end. Ends it.
  std::map<std::string, std::vector<int>> recordedAtEnd() {
    EXPECT_EQ(daemon.stop(), 0);
    const RecordedEvents events(daemon.storePath());
    std::map<std::string, std::vector<int>> numbers;
    for (const std::string& name : {kAsTelephony, kAsLongFormAudio}) {
      for (const auto& event : events.named(name)) numbers[name].push_back(event.at("number"));
    }
    return numbers;
  }
};

TEST_F(SeparationTest, AMessageGoesToTheSessionOfItsOwnUserAlthoughAnothersIsOlder) {
  ASSERT_TRUE(startDaemon());
  const DaemonClient bob = withSession(kBob, 77, kTelephony);
  DaemonClient alice = withSession(kAlice, 77, kLongFormAudio);
  DaemonClient second = connectAs(kAlice);  // as each of a user's clients may
  send(alice, 1, {77});
  send(second, 2, {77});
  send(second, 3, {77, 4711});
  EXPECT_EQ(second.serviceType(77), kLongFormAudio);
  auto recorded = recordedAtEnd();
  EXPECT_THAT(recorded[kAsLongFormAudio], ElementsAre(1, 2, 3));
  EXPECT_THAT(recorded[kAsTelephony], IsEmpty());
}

TEST_F(SeparationTest, AMessageThatNamesAnotherUsersSessionReachesNobody) {
  ASSERT_TRUE(startDaemon());
  DaemonClient bob = withSession(kBob, 77, kTelephony);
  DaemonClient alice = withSession(kAlice, 78, kLongFormAudio);
  send(alice, 1, {77});
  send(alice, 2, {77, 77});
  send(alice, 3, {77, 78});
  send(bob, 4, {77});
  auto recorded = recordedAtEnd();
  EXPECT_THAT(recorded[kAsTelephony], ElementsAre(4));
  EXPECT_THAT(recorded[kAsLongFormAudio], ElementsAre(3));
}

TEST_F(SeparationTest, ABroadcastReachesTheSessionsOfAllClientsOfItsUserAndNoOthers) {
  ASSERT_TRUE(startDaemon());
  const DaemonClient bob = withSession(kBob, 77, kTelephony);
  DaemonClient alice = withSession(kAlice, 78, kLongFormAudio);
  const DaemonClient second = withSession(kAlice, 79, kLongFormAudio);
  send(alice, 1, {});
  auto recorded = recordedAtEnd();
  EXPECT_THAT(recorded[kAsLongFormAudio], ElementsAre(1, 1));
  EXPECT_THAT(recorded[kAsTelephony], IsEmpty());
}

TEST_F(SeparationTest, ATrustedUsersBroadcastReachesTheSessionsOfAllUsers) {
  ASSERT_TRUE(startDaemon());
  const DaemonClient bob = withSession(kBob, 77, kTelephony);
  const DaemonClient alice = withSession(kAlice, 78, kLongFormAudio);
  DaemonClient root = connect();
  send(root, 1, {});
  send(root, 2, {77});
  send(root, 3, {77, 78});
  auto recorded = recordedAtEnd();
  EXPECT_THAT(recorded[kAsTelephony], ElementsAre(1, 2, 3));
  EXPECT_THAT(recorded[kAsLongFormAudio], ElementsAre(1, 3));
}

TEST_F(SeparationTest, ListsAndQuestionsShowAUserItsOwnSessionsAndATrustedUserAll) {
  ASSERT_TRUE(startDaemon());
  DaemonClient bob = withSession(kBob, 79, kTelephony);
  DaemonClient alice = withSession(kAlice, 78, kLongFormAudio);
  const DaemonClient second = withSession(kAlice, 77, kLongFormAudio);
  DaemonClient root = connect();
  EXPECT_THAT(bob.allReporters(), ElementsAre(79));
  EXPECT_THAT(alice.allReporters(), ElementsAre(78, 77));
  EXPECT_THAT(root.allReporters(), ElementsAre(79, 78, 77));  // in the order of the connections

  EXPECT_EQ(validIdentifier(alice, 77), 77);
  EXPECT_EQ(validIdentifier(alice, 79), 0);
  EXPECT_EQ(validIdentifier(bob, 77), 0);
  EXPECT_EQ(validIdentifier(root, 79), 79);
  EXPECT_EQ(alice.serviceType(77), kLongFormAudio);
  EXPECT_EQ(alice.serviceType(79), kNoService);
  EXPECT_EQ(bob.serviceType(77), kNoService);
  EXPECT_EQ(root.serviceType(79), kTelephony);
}

TEST_F(SeparationTest, ClientsOfOneUserReachEachOthersSessions) {
  ASSERT_TRUE(startDaemon());
  const DaemonClient first = withSession(kAlice, 77, kLongFormAudio);
  DaemonClient second = connectAs(kAlice);
  EXPECT_EQ(second.serviceType(77), kLongFormAudio);
  EXPECT_THAT(second.allReporters(), ElementsAre(77));
  EXPECT_EQ(validIdentifier(second, 77), 77);
}

TEST_F(SeparationTest, OnlyTrustedUsersMayWatch) {
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.service.toml",
                                        "trusted_users = [" + std::to_string(kBob) + "]\n"));
  ASSERT_TRUE(startDaemon());
  DaemonClient alice = connectAs(kAlice);
  const Answer refused = alice.call("watch.sessions", {Value(0)});
  EXPECT_EQ(refused.error.value_or(ReplyError()).code, kNotPermitted);
  DaemonClient bob = connectAs(kBob);
  EXPECT_FALSE(bob.call("watch.sessions", {Value(0)}).error);
}

TEST_F(SeparationTest, UsersThatThePreferenceNamesReachAllSessions) {
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.service.toml",
                                        "trusted_users = [\"nobody\", " + std::to_string(kBob) + "]\n"));
  ASSERT_TRUE(startDaemon());
  DaemonClient alice = withSession(kAlice, 78, kLongFormAudio);
  DaemonClient byNumber = withSession(kBob, 77, kTelephony);
  DaemonClient byName = connectAs(kOtherUser);
  EXPECT_THAT(byNumber.allReporters(), SizeIs(2));
  EXPECT_THAT(byName.allReporters(), SizeIs(2));
  EXPECT_THAT(alice.allReporters(), ElementsAre(78));
}

TEST_F(SeparationTest, OnlyATrustedUserMayEndTheDaemon) {
  ASSERT_TRUE(startDaemon());
  DaemonClient witness = withSession(kBob, 77, kTelephony);
  UserProcess refused(daemon, kAlice, {"ask", "killService"});
  EXPECT_EQ(refused.outputAtEnd(), "error 4\n");
  DaemonClient silent = connectAs(kAlice);
  silent.notify("killService", {});
  EXPECT_THAT(silent.allReporters(), IsEmpty());
  EXPECT_EQ(witness.serviceType(77), kTelephony);
  EXPECT_TRUE(daemon.process().isRunning());

  UserProcess root(daemon, 0, {"ask", "killService"});
  EXPECT_EQ(root.outputAtEnd(), "gone\n");
  EXPECT_EQ(daemon.process().wait(), 2);
}

TEST_F(SeparationTest, AUserThatThePreferenceNamesMayEndTheDaemon) {
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.service.toml",
                                        "trusted_users = [" + std::to_string(kBob) + "]\n"));
  ASSERT_TRUE(startDaemon());
  UserProcess refused(daemon, kAlice, {"ask", "killService"});
  EXPECT_EQ(refused.outputAtEnd(), "error 4\n");
  UserProcess bob(daemon, kBob, {"ask", "killService"});
  EXPECT_EQ(bob.outputAtEnd(), "gone\n");
  EXPECT_EQ(daemon.process().wait(), 2);
}

}  // namespace
}  // namespace tonewerk
