// SPDX-License-Identifier: Apache-2.0
// Tests the C interface with a scripted daemon.
#include "tonewerk/reporting.h"

#include <gmock/gmock.h>
#include <limits>
#include <thread>

#include "client/ClientTest.h"
#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

using ReportingTest = ClientTest;

TEST_F(ReportingTest, OpensNothingUntilSomethingIsAskedFor) {
  EXPECT_EQ(info().state, TWR_STATE_IDLE);
  EXPECT_FALSE(daemon->hasCaller());
  EXPECT_STREQ(info().socket_path, "");
}

TEST_F(ReportingTest, SendsASessionsCallsInTheirOrder) {
  const auto connection = connectWithSession();
  EXPECT_EQ(twr_session_id(session), 77);
  EXPECT_EQ(twr_session_set_service_type(session, TWR_SERVICE_LONG_FORM_AUDIO, nullptr, nullptr), TWR_OK);
  TestPayload configuration;
  twr_put_text(configuration.get(), "name", "tone");
  EXPECT_EQ(twr_session_set_configuration(session, configuration.get(), nullptr, nullptr), TWR_OK);
  EXPECT_EQ(twr_session_start(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(send(1), TWR_OK);
  EXPECT_EQ(twr_session_stop(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(twr_session_destroy(session, nullptr, nullptr), TWR_OK);
  EXPECT_THAT(connection->nextTexts(6),
              ElementsAre("setServiceType 7 77", "setConfiguration {\"name\":\"tone\"} 77",
                          "startReportingSessionForID 77", message(1), "stopReportingSessionForID 77",
                          "destroyReportingSession 77"));
}

TEST_F(ReportingTest, ChoosesAnIdentifierWhereNoneIsGiven) {
  twr_session* one = twr_session_create(client, TWR_NEW_ID);
  twr_session* other = twr_session_create(client, TWR_NEW_ID);
  EXPECT_GT(twr_session_id(one), std::numeric_limits<std::int32_t>::max());
  EXPECT_NE(twr_session_id(one), twr_session_id(other));
}

TEST_F(ReportingTest, StampsAMessageThatHasNoTime) {
  const auto connection = connectWithSession();
  TestPayload payload;
  const double before =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  EXPECT_EQ(twr_session_send(session, TWR_CATEGORY_VOLUME, TWR_TYPE_GENERIC, payload.get(), nullptr, nullptr),
            TWR_OK);
  const double stamp = connection->nextMap().number("twreporting_timestamp");
  const double after =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  EXPECT_GE(stamp, before - 0.001);
  EXPECT_LE(stamp, after + 0.001);
}

TEST_F(ReportingTest, CallsBackInTheOrderOfTheAnswers) {
  const auto connection = connectWithSession();
  ASSERT_EQ(twr_session_start(session, AnswerLog::note, log.as("start")), TWR_OK);
  ASSERT_EQ(send(1, AnswerLog::note, log.as("send")), TWR_OK);
  ASSERT_EQ(twr_session_stop(session, AnswerLog::note, log.as("stop")), TWR_OK);
  const RpcFrame start = connection->next();
  const RpcFrame message = connection->next();
  const RpcFrame stop = connection->next();
  EXPECT_EQ(textOf(start), "startReportingSessionForID 77 ?");
  EXPECT_EQ(textOf(stop), "stopReportingSessionForID 77 ?");
  connection->answer(message.identifier, std::nullopt);
  connection->answer(start.identifier, true);
  connection->answer(stop.identifier, true);
  EXPECT_EQ(log.next(), "send: done");
  EXPECT_EQ(log.next(), "start: done");
  EXPECT_EQ(log.next(), "stop: done");
}

TEST_F(ReportingTest, DeliversTheDaemonsError) {
  const auto connection = connectWithSession();
  std::string domain;
  std::string words;
  std::int64_t code = 0;
  void* context = log.as("send", [&](const twr_answer& answer) {
    domain = answer.error_domain;
    code = answer.error_code;
    words = answer.error_message;
  });
  ASSERT_EQ(send(1, AnswerLog::note, context), TWR_OK);
  connection->refuse(connection->next().identifier, {"com.orvane.audio.reporting", 1, "off"});
  EXPECT_EQ(log.next(), "send: the daemon refused the request");
  EXPECT_EQ(domain, "com.orvane.audio.reporting");
  EXPECT_EQ(code, 1);
  EXPECT_EQ(words, "off");
}

TEST_F(ReportingTest, AnswersWithoutAnErrorHaveEmptyTexts) {
  const auto connection = connectWithSession();
  std::string seen = "nothing";
  std::size_t size = 99;
  void* context = log.as("send", [&](const twr_answer& answer) {
    seen = std::string(answer.error_domain) + answer.error_message;
    size = answer.result_size;
    EXPECT_EQ(answer.result, nullptr);
  });
  ASSERT_EQ(send(1, AnswerLog::note, context), TWR_OK);
  connection->answer(connection->next().identifier, std::nullopt);
  log.next();
  EXPECT_EQ(seen, "");
  EXPECT_EQ(size, 0U);
}

TEST_F(ReportingTest, ReadsAServiceTypeOutOfTheAnswer) {
  unsigned type = 0;
  ASSERT_EQ(twr_client_get_service_type(
                client, 42, AnswerLog::note,
                log.as("type", [&](const twr_answer& answer) { type = answer.service_type; })),
            TWR_OK);
  const auto connection = daemon->accept();
  const RpcFrame frame = connection->next();
  EXPECT_EQ(textOf(frame), "getServiceNameForReporterID 42 ?");
  connection->answer(frame.identifier, 7);
  EXPECT_EQ(log.next(), "type: done");
  EXPECT_EQ(type, TWR_SERVICE_LONG_FORM_AUDIO);
}

TEST_F(ReportingTest, TakesTheFirstOfTwoAnswers) {
  ASSERT_EQ(twr_client_get_service_type(client, 0, AnswerLog::note, log.as("first")), TWR_OK);
  ASSERT_EQ(twr_client_get_all_reporters(client, AnswerLog::note, log.as("second")), TWR_OK);
  const auto connection = daemon->accept();
  const std::uint32_t identifier = connection->next().identifier;
  connection->answer(identifier, 65535);
  connection->answer(identifier, 65535);
  connection->answer(connection->next().identifier, Value(ValueArray()));
  EXPECT_EQ(log.next(), "first: done");
  EXPECT_EQ(log.next(), "second: done");
  EXPECT_THAT(log.rest(), IsEmpty());
}

TEST_F(ReportingTest, ReadsValidityOutOfTheAnswer) {
  std::int64_t reporter = 0;
  unsigned type = 0;
  void* context = log.as("valid", [&](const twr_answer& answer) {
    reporter = answer.reporter_id;
    type = answer.service_type;
  });
  ASSERT_EQ(twr_client_validate(client, -5, AnswerLog::note, context), TWR_OK);
  const auto connection = daemon->accept();
  const RpcFrame frame = connection->next();
  EXPECT_EQ(textOf(frame), "reporterIDValid -5 ?");
  connection->answer(frame.identifier, Value(ValueMap{{"reporterID", -5}, {"serviceType", 2}}));
  EXPECT_EQ(log.next(), "valid: done");
  EXPECT_EQ(reporter, -5);
  EXPECT_EQ(type, TWR_SERVICE_TELEPHONY);
}

TEST_F(ReportingTest, ReadsReportersOutOfTheAnswer) {
  std::vector<std::int64_t> reporters;
  std::string result;
  void* context = log.as("all", [&](const twr_answer& answer) {
    reporters.assign(answer.reporter_ids, answer.reporter_ids + answer.reporter_id_count);
    result.assign(static_cast<const char*>(answer.result), answer.result_size);
  });
  ASSERT_EQ(twr_client_get_all_reporters(client, AnswerLog::note, context), TWR_OK);
  const auto connection = daemon->accept();
  connection->answer(connection->next().identifier, Value(ValueArray(std::vector<Value>{1, -2})));
  EXPECT_EQ(log.next(), "all: done");
  EXPECT_THAT(reporters, ElementsAre(1, -2));
  EXPECT_EQ(result, "\x92\x01\xFE");
}

TEST_F(ReportingTest, LeavesAnUnexpectedResultAlone) {
  unsigned type = 0;
  ASSERT_EQ(twr_client_get_service_type(
                client, 42, AnswerLog::note,
                log.as("type", [&](const twr_answer& answer) { type = answer.service_type; })),
            TWR_OK);
  const auto connection = daemon->accept();
  connection->answer(connection->next().identifier, "seven");
  EXPECT_EQ(log.next(), "type: done");
  EXPECT_EQ(type, TWR_SERVICE_UNKNOWN);
}

TEST_F(ReportingTest, SendsToTheSessionsNamedOrToAll) {
  TestPayload payload;
  twr_put_double(payload.get(), "twreporting_timestamp", 2);
  const std::int64_t identifiers[] = {5, -6};
  ASSERT_EQ(twr_client_send(client, TWR_CATEGORY_VOLUME | TWR_DOMAIN_HAL, TWR_TYPE_STATE, payload.get(),
                            identifiers, 2, nullptr, nullptr),
            TWR_OK);
  ASSERT_EQ(twr_client_send(client, 1, 2, payload.get(), nullptr, 0, nullptr, nullptr), TWR_OK);
  EXPECT_THAT(daemon->accept()->nextTexts(2),
              ElementsAre("sendMessage {\"twreporting_timestamp\":2.0} 536870926 18 [5,-6]",
                          "sendMessage {\"twreporting_timestamp\":2.0} 1 2 nil"));
}

TEST_F(ReportingTest, SendsAnyMethodByItsName) {
  std::vector<unsigned char> memory(256);
  twr_payload list;
  twr_payload_init_list(&list, memory.data(), memory.size());
  twr_put_int(&list, nullptr, 7);
  twr_put_nil(&list);
  ASSERT_EQ(twr_client_request(client, "newMethod", &list, nullptr, nullptr), TWR_OK);
  ASSERT_EQ(twr_client_request(client, "bare", nullptr, AnswerLog::note, log.as("bare")), TWR_OK);
  EXPECT_THAT(daemon->accept()->nextTexts(2), ElementsAre("newMethod 7 nil", "bare ?"));
}

TEST_F(ReportingTest, ReportsTheKilledDaemonByTheConnectionsEnd) {
  ASSERT_EQ(twr_client_kill_service(client, AnswerLog::note, log.as("kill")), TWR_OK);
  auto connection = daemon->accept();
  EXPECT_EQ(connection->nextText(), "killService ?");
  connection.reset();
  EXPECT_EQ(log.next(), "kill: not connected to the daemon");
}

TEST_F(ReportingTest, RefusesInvalidArguments) {
  TestPayload payload;
  twr_payload list;
  twr_payload_init_list(&list, nullptr, 0);
  session = twr_session_create(client, 77);
  EXPECT_EQ(twr_session_send(session, 1, 1, nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_send(session, 1, 1, &list, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_send(client, 1, 1, payload.get(), nullptr, 1, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_set_configuration(session, &list, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_set_configuration(session, nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_request(client, nullptr, nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_request(client, "\xFF", nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_request(client, "map", payload.get(), nullptr, nullptr), TWR_INVALID);
  twr_open_map(payload.get(), "open");
  EXPECT_EQ(twr_session_send(session, 1, 1, payload.get(), nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_get_info(client, nullptr), TWR_INVALID);
}

TEST_F(ReportingTest, AllowsNullForEveryObject) {
  TestPayload payload;
  twr_client_destroy(nullptr, 0);
  EXPECT_EQ(twr_client_connect(nullptr, 0), TWR_INVALID);
  EXPECT_EQ(twr_client_flush(nullptr, 0), TWR_INVALID);
  EXPECT_EQ(twr_client_get_info(nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_send(nullptr, 1, 1, payload.get(), nullptr, 0, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_get_service_type(nullptr, 1, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_validate(nullptr, 1, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_get_all_reporters(nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_kill_service(nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_client_request(nullptr, "a", nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_create(nullptr, 1), nullptr);
  EXPECT_EQ(twr_session_id(nullptr), 0);
  EXPECT_EQ(twr_session_set_service_type(nullptr, 1, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_set_configuration(nullptr, payload.get(), nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_start(nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_send(nullptr, 1, 1, payload.get(), nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_stop(nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_destroy(nullptr, nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_sender_open(nullptr, 0), nullptr);
  EXPECT_EQ(twr_sender_send(nullptr, 1, 1, payload.get()), TWR_INVALID);
  EXPECT_EQ(twr_sender_dropped(nullptr), 0U);
  twr_sender_close(nullptr);
}

TEST_F(ReportingTest, RefusesAFrameOverItsLimitAtTheCall) {
  const auto connection = connectWithSession();
  TestPayload large(kMaxFrameBytes + 4096);
  const std::string text(kMaxFrameBytes - 64, 'x');
  ASSERT_EQ(twr_put_text(large.get(), "text", text.c_str()), TWR_OK);
  EXPECT_EQ(twr_session_send(session, 1, 1, large.get(), nullptr, nullptr), TWR_TOO_LARGE);
  EXPECT_EQ(twr_session_set_configuration(session, large.get(), nullptr, nullptr), TWR_TOO_LARGE);
  EXPECT_EQ(twr_client_send(client, 1, 1, large.get(), nullptr, 0, nullptr, nullptr), TWR_TOO_LARGE);
  const std::vector<std::int64_t> many(200'000, 5);
  TestPayload small;
  EXPECT_EQ(twr_client_send(client, 1, 1, small.get(), many.data(), many.size(), nullptr, nullptr),
            TWR_TOO_LARGE);
  std::vector<unsigned char> memory(kMaxFrameBytes + 4096);
  twr_payload list;
  twr_payload_init_list(&list, memory.data(), memory.size());
  ASSERT_EQ(twr_put_text(&list, nullptr, text.c_str()), TWR_OK);
  ASSERT_EQ(twr_put_text(&list, nullptr, text.substr(0, 64).c_str()), TWR_OK);
  EXPECT_EQ(twr_client_request(client, "m", &list, nullptr, nullptr), TWR_TOO_LARGE);
  // Refused requests are not sent, and the connection stays open.
  EXPECT_EQ(send(1), TWR_OK);
  EXPECT_EQ(connection->nextText(), message(1));
}

TEST_F(ReportingTest, RefusesAConfigurationThatHasGrownOverAFrame) {
  const auto connection = connectWithSession();
  TestPayload half(kMaxFrameBytes);
  const std::string text(kMaxFrameBytes / 2 + 1024, 'x');
  ASSERT_EQ(twr_put_text(half.get(), "a", text.c_str()), TWR_OK);
  EXPECT_EQ(twr_session_set_configuration(session, half.get(), nullptr, nullptr), TWR_OK);
  TestPayload other(kMaxFrameBytes);
  ASSERT_EQ(twr_put_text(other.get(), "b", text.c_str()), TWR_OK);
  EXPECT_EQ(twr_session_set_configuration(session, other.get(), nullptr, nullptr), TWR_TOO_LARGE);
}

TEST_F(ReportingTest, CarriesTheLargestMessageThatFitsAFrame) {
  ClientSettings large = settings(path);
  large.queueBytes = 2 * kMaxFrameBytes;
  makeClientWith(large);
  const auto connection = connectWithSession();
  TestPayload payload(kMaxFrameBytes);
  const std::string text(kMaxFrameBytes - 256, 'x');
  ASSERT_EQ(twr_put_text(payload.get(), "text", text.c_str()), TWR_OK);
  ASSERT_EQ(twr_session_send(session, 1, 1, payload.get(), nullptr, nullptr), TWR_OK);
  EXPECT_EQ(connection->nextMap().text("text"), text);
}

TEST_F(ReportingTest, KnowsNoMoreSessionsThanTheDaemon) {
  for (std::size_t at = 0; at < ClientOutbox::kMaxSessions; ++at)
    ASSERT_NE(session = twr_session_create(client, static_cast<std::int64_t>(at + 10)), nullptr);
  EXPECT_EQ(twr_session_create(client, 9), nullptr);
  EXPECT_EQ(twr_session_destroy(session, nullptr, nullptr), TWR_OK);
  EXPECT_NE(twr_session_create(client, 9), nullptr);
}

TEST_F(ReportingTest, DescribesEveryStatus) {
  for (int status = TWR_OK; status <= TWR_DESTROYED; ++status)
    EXPECT_STRNE(twr_status_text(static_cast<twr_status>(status)), "unknown status");
  EXPECT_STREQ(twr_status_text(static_cast<twr_status>(15)), "unknown status");
  EXPECT_THAT(twr_version(), testing::MatchesRegex("[0-9]+\\.[0-9]+\\.[0-9]+"));
}

TEST_F(ReportingTest, TakesTheOptionsOfAnOlderProgram) {
  twr_client_options options{};
  options.size = offsetof(twr_client_options, queue_bytes);
  options.socket_path = path.c_str();
  options.flags = TWR_CLIENT_ONCE;  // beyond the size that the program has given
  twr_client* other = twr_client_create(&options);
  daemon.reset();
  EXPECT_EQ(twr_client_connect(other, kScriptPatienceMs), TWR_NOT_CONNECTED);
  twr_client_info known{};
  known.size = sizeof(known);
  EXPECT_EQ(twr_client_get_info(other, &known), TWR_OK);
  EXPECT_NE(known.state, TWR_STATE_ENDED);
  twr_client_destroy(other, 0);
}

TEST_F(ReportingTest, WritesOnlyAsMuchInformationAsTheCallerKnows) {
  twr_client_info known{};
  known.size = offsetof(twr_client_info, connections);
  known.connections = 4711;
  EXPECT_EQ(twr_client_get_info(client, &known), TWR_OK);
  EXPECT_EQ(known.connections, 4711U);
  EXPECT_EQ(known.size, offsetof(twr_client_info, connections));
}

TEST_F(ReportingTest, MayBeAskedForMoreInsideACallback) {
  const auto connection = connectWithSession();
  void* inner = log.as("inner");
  void* context = log.as("outer", [&](const twr_answer&) {
    EXPECT_EQ(send(2, AnswerLog::note, inner), TWR_OK);
    EXPECT_EQ(twr_client_flush(client, 1000), TWR_WOULD_WAIT);
    EXPECT_EQ(twr_client_connect(client, 1000), TWR_WOULD_WAIT);
  });
  ASSERT_EQ(send(1, AnswerLog::note, context), TWR_OK);
  connection->answer(connection->next().identifier, std::nullopt);
  connection->answer(connection->next().identifier, std::nullopt);
  EXPECT_EQ(log.next(), "outer: done");
  EXPECT_EQ(log.next(), "inner: done");
}

// It once did nothing there, and a program that dropped its last reference in a reply kept the client for
// ever.
TEST_F(ReportingTest, MayBeDestroyedInsideItsOwnCallback) {
  ClientSettings chosen = settings(path);
  chosen.stateChanged = AnswerLog::noteState;
  chosen.context = &log;
  makeClientWith(chosen);
  const auto connection = connectWithSession();
  EXPECT_EQ(log.next(), "state " + std::to_string(TWR_STATE_CONNECTING));
  EXPECT_EQ(log.next(), "state " + std::to_string(TWR_STATE_CONNECTED));
  void* last = log.as("last", [&](const twr_answer&) { twr_client_destroy(client, 0); });
  ASSERT_EQ(send(1, AnswerLog::note, last), TWR_OK);
  ASSERT_EQ(send(2, AnswerLog::note, log.as("pending")), TWR_OK);
  const std::uint32_t first = connection->next().identifier;
  connection->next();  // so that only the end of the connection is left to read
  connection->answer(first, std::nullopt);
  EXPECT_EQ(log.next(), "last: done");
  EXPECT_EQ(log.next(), "pending: the client was destroyed before the answer came");
  EXPECT_TRUE(connection->waitForEnd());
  client = makeClient(settings(path));  // also frees the other client
  EXPECT_THAT(log.rest(), IsEmpty());
}

TEST_F(ReportingTest, ClientsMayBeDestroyedWhileOthersAreUsed) {
  const auto connection = connectWithSession();
  std::thread other([&] {
    for (int at = 0; at < 50; ++at) {
      twr_client* own = makeClient(settings(path + "-nobody"));
      twr_session_create(own, at + 1);
      twr_client_destroy(own, 0);
    }
  });
  for (int at = 0; at < 50; ++at) EXPECT_EQ(twr_client_flush(client, kScriptPatienceMs), TWR_OK);
  other.join();
}

}  // namespace
}  // namespace tonewerk
