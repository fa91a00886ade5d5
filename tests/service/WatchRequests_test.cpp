// SPDX-License-Identifier: Apache-2.0
#include "service/WatchRequests.h"

#include <numeric>
#include <string>
#include <vector>

#include "protocol/Requests.h"
#include "service/MessageFilter.h"
#include "service/SessionListing.h"
#include "support/ServiceTest.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr std::uint32_t kOther = MemoryMessaging::kOwner + 1;
const Arguments kNoFilter{std::nullopt, std::nullopt, std::nullopt};

class WatchRequestsTest : public ServiceTest {
 protected:
  void send(MemoryClient& client, ValueMap message, const std::vector<ReporterID>& reporterIDs,
            AudioEventCategory category = 4, AudioEventType type = 1) {
    Argument recipients;
    if (!reporterIDs.empty())
      recipients = ValueArray(std::vector<Value>(reporterIDs.begin(), reporterIDs.end()));
    ask(client, "sendMessage", {Value(std::move(message)), Value(category), Value(type), recipients});
  }
  void open(MemoryClient& client, const Arguments& filter = kNoFilter) {
    EXPECT_EQ(askOnce(client, "watch.openMessages", filter), Value(true));
  }
  // Sends a request that is answered at once; returns the messages in the answer.
  std::vector<ValueMap> nextMessages(MemoryClient& client) {
    std::vector<ValueMap> messages;
    const Value answer = askOnce(client, "watch.nextMessages", {});
    if (answer.asMap() == nullptr) return messages;
    for (const Value& message : *answer.asMap()->find("messages")->asArray())
      messages.push_back(*message.asMap());
    return messages;
  }
  std::vector<ReporterID> sessionsOf(const std::vector<ValueMap>& messages) {
    std::vector<ReporterID> identifiers;
    for (const ValueMap& message : messages) identifiers.push_back(message.integer("reporterID"));
    return identifiers;
  }
  std::vector<ValueMap> listSessions(MemoryClient& client, std::int64_t first = 0) {
    std::vector<ValueMap> sessions;
    const Value answer = askOnce(client, "watch.sessions", {first});
    total = answer.asMap()->integer("total");
    for (const Value& session : *answer.asMap()->find("sessions")->asArray())
      sessions.push_back(*session.asMap());
    return sessions;
  }
  std::optional<ReplyError> refusalOf(MemoryClient& client, std::string_view method, Arguments arguments) {
    const auto answers = ask(client, method, std::move(arguments));
    EXPECT_THAT(answers, SizeIs(1));
    return answers.empty() ? std::nullopt : answers[0].error;
  }

  std::int64_t total = 0;
};

// Permissions.

TEST_F(WatchRequestsTest, IsForTrustedUsers) {
  const std::vector<std::pair<std::string, Arguments>> requests{
      {"watch.sessions", {0}}, {"watch.openMessages", kNoFilter}, {"watch.nextMessages", {}}};
  for (const auto& [method, arguments] : requests) {
    SCOPED_TRACE(method);
    const auto other = messaging.connect(12, kOther);
    const auto refusal = refusalOf(*other, method, arguments);
    ASSERT_TRUE(refusal);
    EXPECT_EQ(*refusal, messagingError(4, "not permitted: " + method + " is for trusted users"));
  }
  const auto root = messaging.connect(13, 0);
  open(*root);
  listSessions(*root);
}

// The daemon itself.

TEST_F(WatchRequestsTest, SaysWhatTheDaemonIsToEverybodyAndWhatItLoggedToTrustedUsers) {
  test.status.version = "1.0";
  test.status.troubles = [] { return std::vector<LoggedTrouble>{{5.0, "twrs", "cannot write", 1, 1000}}; };
  test.deviceFacts.set("InternalBuild", true);
  const auto other = messaging.connect(12, kOther);
  const Value seen = askOnce(*other, "watch.accounts", {});
  const ValueMap& daemon = *seen.asMap()->find("daemon")->asMap();
  EXPECT_EQ(daemon.text("version"), "1.0");
  EXPECT_TRUE(daemon.boolean("internalBuild"));
  for (const char* hidden : {"sinks", "endpoints", "troubles"})
    EXPECT_FALSE(seen.asMap()->contains(hidden)) << hidden;
  const auto root = messaging.connect(13, 0);
  const Value all = askOnce(*root, "watch.accounts", {});
  EXPECT_TRUE(all.asMap()->contains("sinks") && all.asMap()->contains("endpoints"));
  EXPECT_THAT(all.asMap()->find("troubles")->text(), testing::HasSubstr("cannot write"));
}

// Sessions.

TEST_F(WatchRequestsTest, DescribesEachSession) {
  test.processes.setName(11, "player");
  const auto client = connect(11);
  create(*client, 77);
  ask(*client, "setServiceType", {7, 77});
  ask(*client, "setConfiguration", {ValueMap{{"HostApplicationDisplayID", "com.example.player"}}, 77});
  ask(*client, "startReportingSessionForID", {77});
  send(*client, {{"volume", 0.5}, {"active_devices", "Speaker"}}, {77});
  send(*client, {{"volume", 0.5}, {"active_devices", "Speaker"}}, {77});
  send(*client, {{"volume", 0.8}}, {77});
  test.clock.advance(12.5);
  const auto watcher = connect(12);
  EXPECT_EQ(
      askOnce(*watcher, "watch.sessions", {0}).text(),
      R"({"total":1,"sessions":[{"reporterID":77,"serviceType":7,"serviceName":")" +
          sessionOf(0, 77)->serviceName() +
          R"(","started":true,"singleMessageSession":false,"application":"com.example.player",)"
          R"("messages":3,"redundant":1,"overloads":0,"device":"Speaker","processIdentifier":11,"processName":"player",)"
          R"("seconds":12.5}]})");
}

// Overloads are counted by a worker.
class WatchedOverloadsTest : public ServiceTest {
 protected:
  WatchedOverloadsTest() : ServiceTest(allWorkerClasses()) {}
};

TEST_F(WatchedOverloadsTest, ASessionHasThoseSinceItsStart) {
  const auto client = connect(11);
  start(*client, 77);
  const auto overloads = [&] {
    const Value answer = askOnce(*client, "watch.sessions", {0});
    return answer.asMap()->find("sessions")->asArray()->begin()->asMap()->integer("overloads");
  };
  for (int count = 0; count < 2; ++count) {
    ask(*client, "sendMessage",
        {ValueMap{{"issue_type", "overload"}}, 7, static_cast<int>(kTypeError), Value(ValueArray{77})});
  }
  EXPECT_EQ(overloads(), 2);
  ask(*client, "stopReportingSessionForID", {77});
  EXPECT_EQ(overloads(), 0);
}

TEST_F(WatchRequestsTest, ASessionThatIsNotStartedHasNoRunningTime) {
  const auto client = connect(11);
  create(*client, 77);
  const auto sessions = listSessions(*client);
  ASSERT_THAT(sessions, SizeIs(1));
  EXPECT_FALSE(sessions[0].contains("seconds"));
  EXPECT_FALSE(sessions[0].boolean("started"));
  EXPECT_FALSE(sessions[0].contains("processName"));
}

TEST_F(WatchRequestsTest, CountsFromZeroAfterAStop) {
  const auto client = connect(11);
  start(*client, 77);
  send(*client, {{"a", 1}}, {77});
  send(*client, {{"a", 1}}, {77});
  ask(*client, "stopReportingSessionForID", {77});
  const auto stopped = listSessions(*client);
  ASSERT_THAT(stopped, SizeIs(1));
  EXPECT_EQ(stopped[0].integer("messages"), 0);
  EXPECT_EQ(stopped[0].integer("redundant"), 0);
  EXPECT_FALSE(stopped[0].contains("seconds"));
}

TEST_F(WatchRequestsTest, ListsAllClientsSessionsAndTheSingleMessageSessionLast) {
  const auto first = connect(11);
  const auto second = connect(12);
  create(*second, 5);
  create(*first, 9);
  create(*first, 8);
  send(*second, {{"a", 1}}, {});
  const auto sessions = listSessions(*first);
  EXPECT_THAT(sessionsOf(sessions), ElementsAre(8, 9, 5, 1));
  EXPECT_EQ(total, 4);
  EXPECT_TRUE(sessions.back().boolean("singleMessageSession"));
  EXPECT_EQ(sessions.back().integer("processIdentifier"), test.processes.ownProcessIdentifier());
}

TEST_F(WatchRequestsTest, ListsManySessionsInPortions) {
  const auto first = connect(11);
  const auto second = connect(12);
  const auto most = static_cast<ReporterID>(kMaxListedSessions);
  for (ReporterID reporterID = 1; reporterID <= most; ++reporterID) create(*first, reporterID);
  create(*second, 1001);
  create(*second, 1002);
  const auto portion = listSessions(*first);
  EXPECT_THAT(portion, SizeIs(kMaxListedSessions));
  EXPECT_EQ(total, most + 2);
  EXPECT_THAT(sessionsOf(listSessions(*first, most - 1)), ElementsAre(most, 1001, 1002));
  EXPECT_THAT(sessionsOf(listSessions(*first, most)), ElementsAre(1001, 1002));
  EXPECT_THAT(sessionsOf(listSessions(*first, most + 1)), ElementsAre(1002));
  EXPECT_THAT(listSessions(*first, most + 2), IsEmpty());
  EXPECT_EQ(total, most + 2);
  EXPECT_THAT(listSessions(*first, -1), SizeIs(kMaxListedSessions));
}

TEST_F(WatchRequestsTest, APortionOfTheLongestNamesFitsIntoItsBound) {
  const auto client = connect(11);
  test.processes.setName(12, std::string(300, 'n'));
  const auto longNamed = connect(12);
  const ValueMap configuration{{"HostApplicationDisplayID", std::string(5000, 'x')}};
  for (ReporterID reporterID = 1; reporterID <= 10; ++reporterID) {
    create(*longNamed, reporterID);
    ask(*longNamed, "setConfiguration", {configuration, reporterID});
    ask(*longNamed, "startReportingSessionForID", {reporterID});
    send(*longNamed, {{"active_devices", std::string(5000, 'x')}}, {reporterID});
  }
  const auto sessions = listSessions(*client);
  ASSERT_THAT(sessions, SizeIs(10));
  EXPECT_EQ(sessions[0].text("application").size(), 256U);
  EXPECT_EQ(sessions[0].text("processName").size(), 256U);
  EXPECT_EQ(sessions[0].text("device").size(), 64U);
  EXPECT_LE(sessions[0].bytes() * kMaxListedSessions, requests::kMaxSessionListingBytes);
}

// Messages.

TEST_F(WatchRequestsTest, ShowsMessagesOfEveryClientAsTheyWereStored) {
  const auto client = connect(11);
  start(*client, 77);
  const auto watcher = connect(12);
  open(*watcher);
  send(*client, {{"two words", 1}}, {77});
  const auto messages = nextMessages(*watcher);
  ASSERT_THAT(messages, SizeIs(1));
  EXPECT_EQ(messages[0].integer("reporterID"), 77);
  EXPECT_EQ(messages[0].integer("category"), 4);
  EXPECT_EQ(messages[0].integer("type"), 1);
  EXPECT_EQ(messages[0].number("time"), test.clock.now());
  EXPECT_FALSE(messages[0].boolean("redundant"));
  EXPECT_EQ(*messages[0].find("payload")->asMap(), sessionOf(0, 77)->messages().back()->message);
}

TEST_F(WatchRequestsTest, MarksRedundantMessages) {
  const auto client = connect(11);
  start(*client, 77);
  open(*client);
  send(*client, {{"a", 1}}, {77});
  send(*client, {{"a", 1}}, {77});
  const auto messages = nextMessages(*client);
  ASSERT_THAT(messages, SizeIs(2));
  EXPECT_FALSE(messages[0].boolean("redundant"));
  EXPECT_TRUE(messages[1].boolean("redundant"));
}

TEST_F(WatchRequestsTest, ShowsAMessageOnceForEachSessionItGoesTo) {
  const auto client = connect(11);
  start(*client, 77);
  start(*client, 78);
  open(*client);
  send(*client, {{"a", 1}}, {});
  EXPECT_THAT(sessionsOf(nextMessages(*client)), ElementsAre(77, 78));
}

TEST_F(WatchRequestsTest, ShowsMessagesOfTheSingleMessageSession) {
  const auto client = connect(11);
  open(*client);
  send(*client, {{"a", 1}}, {});
  const auto messages = nextMessages(*client);
  EXPECT_THAT(sessionsOf(messages), ElementsAre(1));
  EXPECT_EQ(messages.at(0).integer("serviceType"), kServiceStandalone);
}

TEST_F(WatchRequestsTest, FiltersInTheDaemon) {
  const auto client = connect(11);
  start(*client, 77);
  start(*client, 78);
  open(*client, {ValueArray{78}, ValueArray{5, 4}, ValueArray{1}});
  send(*client, {{"a", 1}}, {77, 78});
  send(*client, {{"a", 2}}, {78}, 6);
  send(*client, {{"a", 3}}, {78}, 5, 2);
  send(*client, {{"a", 4}}, {78}, 5);
  const auto messages = nextMessages(*client);
  ASSERT_THAT(messages, SizeIs(2));
  EXPECT_EQ(messages[0].find("payload")->asMap()->integer("a"), 1);
  EXPECT_EQ(messages[1].find("payload")->asMap()->integer("a"), 4);
}

TEST_F(WatchRequestsTest, AHeldRequestIsAnsweredByTheNextMessage) {
  const auto client = connect(11);
  start(*client, 77);
  const auto watcher = connect(12);
  open(*watcher);
  EXPECT_THAT(ask(*watcher, "watch.nextMessages", {}), IsEmpty());
  EXPECT_EQ(watcher->unfinishedRequests(), 1U);
  send(*client, {{"a", 1}}, {77});
  EXPECT_THAT(watcher->responses(), SizeIs(2));
  EXPECT_EQ(watcher->unfinishedRequests(), 0U);
}

TEST_F(WatchRequestsTest, AWatcherEndsWithItsConnection) {
  const auto client = connect(11);
  start(*client, 77);
  const auto watcher = connect(12);
  open(*watcher);
  const auto gone = connect(13);
  open(*gone);
  ask(*gone, "watch.nextMessages", {});
  gone->disconnect();
  run();
  EXPECT_EQ(gone->unfinishedRequests(), 0U) << "something still holds its request";
  send(*client, {{"a", 1}}, {77});
  EXPECT_THAT(gone->responses(), SizeIs(1));  // the answer to watch.openMessages
  EXPECT_THAT(nextMessages(*watcher), SizeIs(1));
}

TEST_F(WatchRequestsTest, OpeningAgainShowsEachMessageOnce) {
  const auto client = connect(11);
  start(*client, 77);
  open(*client);
  open(*client);
  send(*client, {{"a", 1}}, {77});
  EXPECT_THAT(nextMessages(*client), SizeIs(1));
}

TEST_F(WatchRequestsTest, MustBeOpenedFirst) {
  const auto client = connect(11);
  EXPECT_EQ(refusalOf(*client, "watch.nextMessages", {}),
            messagingError(2, "watch.nextMessages: watch.openMessages comes first"));
}

TEST_F(WatchRequestsTest, AFilterHasEntriesUpToTheLimit) {
  const auto client = connect(11);
  std::vector<Value> numbers(MessageFilter::kMaxEntries - 1, Value(5));
  open(*client, {ValueArray(numbers), ValueArray{4}, std::nullopt});
  EXPECT_EQ(refusalOf(*client, "watch.openMessages", {ValueArray(numbers), ValueArray{4}, ValueArray{1}}),
            messagingError(3, "the filter has 4097 entries, the most is 4096"));
}

TEST_F(WatchRequestsTest, NumbersThatAreNotACategoryMatchNothing) {
  const auto client = connect(11);
  start(*client, 77);
  // The low 32 bits are those of category 4.
  open(*client, {std::nullopt, ValueArray{(std::int64_t{1} << 32) + 4}, std::nullopt});
  send(*client, {{"a", 1}}, {77});
  EXPECT_THAT(ask(*client, "watch.nextMessages", {}), IsEmpty());
}

TEST_F(WatchRequestsTest, LogsWhoWatches) {
  const auto client = connect(11);
  open(*client);
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo), Contains("client 11 watches messages"));
}

}  // namespace
}  // namespace tonewerk
