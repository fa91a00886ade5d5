// SPDX-License-Identifier: Apache-2.0
#include "tools/journal/SessionChoice.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "protocol/Requests.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::uint32_t kUser = 1001;
constexpr std::uint32_t kOther = 1002;
constexpr std::uint32_t kDaemonUser = 500;

// Requests of some clients. What is chosen is noted by its label.
class SessionChoiceTest : public testing::Test {
 protected:
  void choose(const SessionChoice::Wanted& wanted) { choice_.emplace(wanted, kDaemonUser); }

  void ask(const std::string& label, const Method& method, const Arguments& arguments) {
    const Journal::Origin origin{now, client, user};
    if (choice_->takes(origin, method, arguments)) chosen.push_back(label);
  }
  void create(ReporterID session) {
    ask("create " + std::to_string(session), requests::kCreateReportingSession, {session});
  }
  void start(ReporterID session) {
    ask("start " + std::to_string(session), requests::kStartReportingSessionForID, {session});
  }
  void stop(ReporterID session) {
    ask("stop " + std::to_string(session), requests::kStopReportingSessionForID, {session});
  }
  void destroy(ReporterID session) {
    ask("destroy " + std::to_string(session), requests::kDestroyReportingSession, {session});
  }
  void setType(int type, ReporterID session) {
    ask("type " + std::to_string(session), requests::kSetServiceType, {type, session});
  }
  void send(const std::string& label, const std::vector<ReporterID>& sessions) {
    ValueArray list;
    for (const ReporterID session : sessions) list.append(session);
    ask(label, requests::kSendMessage, {ValueMap{{"a", 1}}, 4, 1, Value(list)});
  }
  void sendToAll(const std::string& label) {
    ask(label, requests::kSendMessage, {ValueMap{{"a", 1}}, 4, 1, std::nullopt});
  }

  std::optional<SessionChoice> choice_;
  double now = 100.0;
  std::uint64_t client = 1;
  std::uint32_t user = kUser;
  std::vector<std::string> chosen;
};

TEST_F(SessionChoiceTest, WithoutAWishEverythingIsChosen) {
  choose({});
  create(7);
  send("to 7", {7});
  send("to an unknown one", {9});
  sendToAll("to all");
  destroy(7);
  stop(9);
  EXPECT_THAT(chosen, ElementsAre("create 7", "to 7", "to an unknown one", "to all", "destroy 7", "stop 9"));
  EXPECT_EQ(choice_->sessions(), 1U);
}

TEST_F(SessionChoiceTest, OneSessionHasItsRequestsAndMessages) {
  choose({.session = 7});
  create(7);
  create(8);
  ask("configuration 7", requests::kSetConfiguration, {ValueMap{}, 7});
  ask("configuration 8", requests::kSetConfiguration, {ValueMap{}, 8});
  start(8);
  start(7);
  send("to 8", {8});
  send("to both", {8, 7});
  stop(7);
  destroy(8);
  destroy(7);
  send("too late", {7});
  EXPECT_THAT(chosen,
              ElementsAre("create 7", "configuration 7", "start 7", "to both", "stop 7", "destroy 7"));
  EXPECT_EQ(choice_->sessions(), 1U);
}

TEST_F(SessionChoiceTest, MessagesToAllSessionsBelongToItWhileItIsStarted) {
  choose({.session = 7});
  create(7);
  sendToAll("before the start");
  start(7);
  sendToAll("while it runs");
  send("to an empty list", {});
  client = 2;
  sendToAll("of another client");
  user = kOther;
  sendToAll("of another user");
  user = kDaemonUser;
  sendToAll("of the daemon's user");
  user = 0;
  sendToAll("of root");
  client = 1;
  user = kUser;
  stop(7);
  sendToAll("after the stop");
  EXPECT_THAT(chosen, ElementsAre("create 7", "start 7", "while it runs", "to an empty list",
                                  "of another client", "of the daemon's user", "of root", "stop 7"));
}

TEST_F(SessionChoiceTest, AnotherServiceTypeEndsTheStartedSession) {
  choose({.session = 7});
  create(7);
  setType(7, 7);
  start(7);
  setType(7, 7);
  sendToAll("while it runs");
  setType(3, 7);
  sendToAll("not started again");
  EXPECT_THAT(chosen, ElementsAre("create 7", "type 7", "start 7", "type 7", "while it runs", "type 7"));
}

TEST_F(SessionChoiceTest, ASessionEndsWithItsClient) {
  choose({.session = 7});
  create(7);
  start(7);
  client = 2;
  create(7);
  choice_->disconnect(1);
  sendToAll("none is started");
  send("to the second", {7});
  choice_->disconnect(2);
  send("to nobody", {7});
  client = 3;
  create(7);
  choice_->disconnectAll();
  send("to nobody", {7});
  EXPECT_THAT(chosen, ElementsAre("create 7", "start 7", "create 7", "to the second", "create 7"));
  EXPECT_EQ(choice_->sessions(), 3U);
}

TEST_F(SessionChoiceTest, RequestsOfOtherClientsForTheSameIdentifierAreNotChosen) {
  choose({.session = 7});
  create(7);
  client = 2;
  start(7);
  destroy(7);
  EXPECT_THAT(chosen, ElementsAre("create 7"));
}

TEST_F(SessionChoiceTest, ATimeChoosesTheSessionsThatWereCreatedInIt) {
  choose({.since = 100.0, .until = 200.0});
  now = 99.0;
  create(1);
  start(1);
  sendToAll("before");
  now = 100.0;
  create(2);
  start(2);
  send("to the first", {1});
  now = 250.0;
  create(3);
  start(3);
  send("to the second", {2});
  sendToAll("to all");
  EXPECT_THAT(chosen, ElementsAre("create 2", "start 2", "to the second", "to all"));
  EXPECT_EQ(choice_->sessions(), 1U);
}

TEST_F(SessionChoiceTest, ATimeChoosesMessagesWithoutASession) {
  choose({.since = 100.0, .until = 200.0});
  for (const double time : {99.0, 100.0, 200.0, 201.0}) {
    now = time;
    sendToAll(std::to_string(static_cast<int>(time)));
  }
  EXPECT_THAT(chosen, ElementsAre("100", "200"));
}

TEST_F(SessionChoiceTest, ASessionThatTakesThePlaceOfAChosenOneEndsIt) {
  choose({.until = 200.0});
  create(7);
  now = 300.0;
  create(7);
  start(7);
  EXPECT_THAT(chosen, ElementsAre("create 7", "create 7"));
}

TEST_F(SessionChoiceTest, RequestsThatOnlyLookAreNotOfASession) {
  choose({.session = 7});
  create(7);
  ask("valid", requests::kReporterIDValid, {7});
  ask("all", requests::kGetAllReporters, {});
  EXPECT_THAT(chosen, ElementsAre("create 7"));
}

}  // namespace
}  // namespace tonewerk
