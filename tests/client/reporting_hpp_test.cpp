// SPDX-License-Identifier: Apache-2.0
//
// Tests that the C++ interface makes the calls of the C interface, and uses no object after its end.
#include <future>
#include <gmock/gmock.h>
#include <memory>
#include <optional>

#include "client/MessageFrame.h"
#include "client/OneFrame.h"
#include "client/ScriptedServer.h"
#include "support/TemporaryDirectory.h"
#include "tonewerk/reporting.hpp"

namespace tonewerk {
namespace {

using reporting::Answer;
using reporting::Category;
using reporting::Client;
using reporting::ClientOptions;
using reporting::Payload;
using reporting::Sender;
using reporting::Service;
using reporting::Session;
using reporting::Status;
using reporting::Type;
using testing::ElementsAre;

constexpr std::chrono::seconds kPatience{30};

// Lets a test wait for the result of a callback.
template <class T>
class Later {
 public:
  auto setter() {
    return [this](T value) { promise_.set_value(std::move(value)); };
  }
  std::optional<T> get() {
    std::future<T> future = promise_.get_future();
    if (future.wait_for(kPatience) != std::future_status::ready) return std::nullopt;
    return future.get();
  }

 private:
  std::promise<T> promise_;
};

class ReportingHppTest : public testing::Test {
 protected:
  Client make() {
    ClientOptions options;
    options.socketPath = path;
    Client client(std::move(options));
    client.setCloseTimeout(
        std::chrono::milliseconds(0));  // the scripted daemon does not close the connection
    return client;
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  ScriptedServer daemon{path};
};

ValueMap readBack(const reporting::AnyPayload& payload) {
  std::string bytes;
  const twr_payload& raw = *payload.get();
  appendMessageFrame(bytes, std::nullopt, {1, 0, 0, 0, raw.entries, {raw.bytes, raw.size}}, 0, {});
  const std::optional<RpcFrame> frame = frameOf(bytes);
  if (!frame || !frame->arguments[0]->asMap()) return {};
  ValueMap map = *frame->arguments[0]->asMap();
  map.erase("twreporting_timestamp");
  return map;
}

TEST_F(ReportingHppTest, PutsEveryKindOfValueByItsType) {
  Payload<512> payload;
  payload.put("bool", true).put("char", 'a').put("int", -5).put("unsigned", UINT64_MAX).put("float", 0.5F);
  payload.put("literal", "a").put("string", std::string("b\0c", 3)).put("view", std::string_view("d"));
  payload.put("date", reporting::Date{12.5});
  payload.put("time", std::chrono::system_clock::time_point(std::chrono::milliseconds(1500)));
  payload.map("map", [](reporting::AnyPayload& map) {
    map.list("list", [](reporting::AnyPayload& list) { list.put(1).put("x").map([](auto&) {}); });
  });
  ASSERT_EQ(payload.problem(), Status::kOk);
  const ValueMap read = readBack(payload);
  EXPECT_EQ(read, (ValueMap{{"bool", true},
                            {"char", 97},
                            {"int", -5},
                            {"unsigned", UINT64_MAX},
                            {"float", 0.5},
                            {"literal", "a"},
                            {"string", std::string("b\0c", 3)},
                            {"view", "d"},
                            {"date", Date{12.5}},
                            {"time", Date{1.5}},
                            {"map", ValueMap{{"list", ValueArray{1, "x", ValueMap{}}}}}}));
  EXPECT_EQ(read.find("bool")->kind(), Value::Kind::kBoolean);
  EXPECT_EQ(read.find("literal")->kind(), Value::Kind::kString);
}

TEST_F(ReportingHppTest, KeepsThePayloadsFirstFailureUntilItIsCleared) {
  Payload<8> payload;
  payload.put("number", 1).put("n", 2);
  EXPECT_EQ(payload.problem(), Status::kTooLarge);
  payload.clear();
  payload.put("n", 2);
  EXPECT_EQ(payload.problem(), Status::kOk);
  EXPECT_EQ(readBack(payload), (ValueMap{{"n", 2}}));
}

TEST_F(ReportingHppTest, AsksWhatTheCInterfaceAsks) {
  Client client = make();
  Session session(client, 77);
  Payload<64> payload;
  payload.put("a", 1).put("twreporting_timestamp", 1.5);
  EXPECT_EQ(session.setServiceType(Service::kTelephony), Status::kOk);
  EXPECT_EQ(session.setConfiguration(payload), Status::kOk);
  EXPECT_EQ(session.start(), Status::kOk);
  EXPECT_EQ(session.send(Category::kIO | reporting::Domain::kHAL, Type::kState, payload), Status::kOk);
  EXPECT_EQ(client.send(Category::kError, Type::kError, payload, {5, 6}), Status::kOk);
  EXPECT_EQ(session.stop(), Status::kOk);
  session.destroy();
  const auto connection = daemon.accept();
  ASSERT_TRUE(connection);
  const std::string map = R"({"a":1,"twreporting_timestamp":1.5})";
  EXPECT_THAT(connection->nextTexts(8),
              ElementsAre("createReportingSession 77", "setServiceType 2 77",
                          "setConfiguration " + map + " 77", "startReportingSessionForID 77",
                          "sendMessage " + map + " 536870919 18 [77]", "sendMessage " + map + " 11 6 [5,6]",
                          "stopReportingSessionForID 77", "destroyReportingSession 77"));
}

TEST_F(ReportingHppTest, GivesAnswersToKeep) {
  Client client = make();
  Later<Answer> validity;
  Later<Answer> reporters;
  Later<Answer> refusal;
  ASSERT_EQ(client.validate(77, validity.setter()), Status::kOk);
  ASSERT_EQ(client.getAllReporters(reporters.setter()), Status::kOk);
  reporting::Parameters<> parameters;
  parameters.putNil().put("x");
  ASSERT_EQ(client.request("method", parameters, refusal.setter()), Status::kOk);
  const auto connection = daemon.accept();
  ASSERT_TRUE(connection);
  connection->answer(connection->next().identifier, Value(ValueMap{{"reporterID", 77}, {"serviceType", 7}}));
  connection->answer(connection->next().identifier, Value(ValueArray{5, 6}));
  const RpcFrame asked = connection->next();
  EXPECT_EQ(textOf(asked), "method nil x ?");
  connection->refuse(asked.identifier, {"domain", 3, "why"});

  std::optional<Answer> answer = validity.get();
  ASSERT_TRUE(answer && *answer);
  EXPECT_EQ(answer->reporterID, 77);
  EXPECT_EQ(answer->serviceType, Service::kLongFormAudio);
  EXPECT_FALSE(answer->result.empty());
  answer = reporters.get();
  ASSERT_TRUE(answer && *answer);
  EXPECT_THAT(answer->reporterIDs, ElementsAre(5, 6));
  answer = refusal.get();
  ASSERT_TRUE(answer && !*answer);
  EXPECT_EQ(answer->status, Status::kRefused);
  EXPECT_EQ(answer->errorDomain, "domain");
  EXPECT_EQ(answer->errorCode, 3);
  EXPECT_EQ(answer->errorMessage, "why");
}

TEST_F(ReportingHppTest, DropsAReplyThatIsNotTaken) {
  const auto token = std::make_shared<int>(1);
  Client client = make();
  Payload<4> tooSmall;
  tooSmall.put("name", 1);
  const Status status =
      client.send(Category::kIO, Type::kState, tooSmall, {}, [token](const Answer&) { FAIL(); });
  EXPECT_EQ(status, Status::kTooLarge);
  EXPECT_EQ(token.use_count(), 1);
}

TEST_F(ReportingHppTest, CallsWaitingRepliesWhenTheClientIsDestroyed) {
  Later<Answer> stopped;
  std::unique_ptr<ScriptedConnection> connection;  // the daemon keeps it open
  {
    Client client = make();
    Session session(client, 77);
    ASSERT_EQ(session.start(stopped.setter()), Status::kOk);
    connection = daemon.accept();
    ASSERT_TRUE(connection);
    connection->nextTexts(2);
  }
  const std::optional<Answer> answer = stopped.get();
  ASSERT_TRUE(answer);
  EXPECT_EQ(answer->status, Status::kDestroyed);
}

TEST_F(ReportingHppTest, ASessionAndASenderKeepTheirOwnersAlive) {
  std::optional<Client> client(make());
  std::optional<Session> session(std::in_place, *client, 77);
  std::optional<Sender> sender(std::in_place, *session);
  ASSERT_TRUE(*sender);
  client->setCloseTimeout(kPatience);
  client.reset();
  EXPECT_EQ(session->start(), Status::kOk);
  session.reset();
  Payload<64> payload;
  payload.put("a", 1).put("twreporting_timestamp", 1.5);
  EXPECT_EQ(sender->send(Category::kIO, Type::kState, payload), Status::kOk);
  auto connection = daemon.accept();
  ASSERT_TRUE(connection);
  EXPECT_THAT(connection->nextTexts(3),
              ElementsAre("createReportingSession 77", "startReportingSessionForID 77",
                          R"(sendMessage {"a":1,"twreporting_timestamp":1.5} 7 18 [77])"));
  EXPECT_EQ(sender->dropped(), 0U);
  // The sender's end destroys the session and the client, which waits until the daemon closes the connection.
  const auto gone = std::async(std::launch::async, [&] { sender.reset(); });
  EXPECT_EQ(connection->nextText(), "destroyReportingSession 77");
  EXPECT_TRUE(connection->waitForEnd());
  connection.reset();
}

TEST_F(ReportingHppTest, AMovedObjectIsEmptyAndItsCallsDoNothing) {
  Client client = make();
  Session session(client, 77);
  Sender sender(session);
  const Client newClient = std::move(client);
  const Session newSession = std::move(session);
  Sender newSender = std::move(sender);
  EXPECT_TRUE(newClient && newSession && newSender);
  // NOLINTBEGIN(bugprone-use-after-move): what becomes of them is the point.
  EXPECT_FALSE(client || session || sender);
  Payload<64> payload;
  EXPECT_EQ(client.flush(std::chrono::milliseconds(0)), Status::kInvalid);
  EXPECT_EQ(client.info().state, reporting::State::kEnded);
  EXPECT_EQ(session.start(), Status::kInvalid);
  EXPECT_EQ(session.id(), 0);
  EXPECT_EQ(sender.send(Category::kIO, Type::kState, payload), Status::kInvalid);
  EXPECT_FALSE(Session(client));
  EXPECT_FALSE(Sender(session));
  // NOLINTEND(bugprone-use-after-move)
  EXPECT_EQ(newSession.id(), 77);

  sender = std::move(newSender);
  EXPECT_TRUE(sender);
  EXPECT_FALSE(newSender);  // NOLINT(bugprone-use-after-move)
}

TEST_F(ReportingHppTest, ReturnsTheClientsState) {
  std::promise<void> connected;
  ClientOptions options;
  options.socketPath = path;
  options.stateChanged = [&](reporting::State state) {
    if (state == reporting::State::kConnected) connected.set_value();
  };
  Client client(std::move(options));
  client.setCloseTimeout(std::chrono::milliseconds(0));
  EXPECT_EQ(client.info().state, reporting::State::kIdle);
  EXPECT_EQ(client.connect(kPatience), Status::kOk);
  EXPECT_EQ(connected.get_future().wait_for(kPatience), std::future_status::ready);
  const reporting::ClientInfo info = client.info();
  EXPECT_EQ(info.state, reporting::State::kConnected);
  EXPECT_EQ(info.socketPath, path);
  EXPECT_EQ(info.connections, 1U);
  EXPECT_STREQ(reporting::text(Status::kFull), twr_status_text(TWR_FULL));
  EXPECT_STREQ(reporting::version(), twr_version());
}

}  // namespace
}  // namespace tonewerk
