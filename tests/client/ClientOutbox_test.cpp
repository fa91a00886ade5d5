// SPDX-License-Identifier: Apache-2.0
#include "client/ClientOutbox.h"

#include <algorithm>
#include <atomic>
#include <gmock/gmock.h>
#include <map>
#include <random>

#include "client/ClientEngine.h"
#include "client/ScriptedServer.h"
#include "client/TestPayload.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Kind = SessionChange::Kind;

// Runs an outbox and reads the frames that it sends, as many bytes at a time as a test chooses.
class ClientOutboxTest : public testing::Test {
 protected:
  std::shared_ptr<twr_session> session(std::int64_t identifier = 77) {
    return outbox->addSession(engine, identifier);
  }
  static SessionChange make(Kind kind) { return {kind, TWR_SERVICE_UNKNOWN, {}}; }
  static SessionChange type(std::uint16_t type) { return {Kind::kServiceType, type, {}}; }
  static SessionChange configuration(ValueMap map) {
    return {Kind::kConfiguration, TWR_SERVICE_UNKNOWN, std::move(map)};
  }
  static PendingReply reply(const char* name) {
    return {[](void*, const twr_answer*) {}, const_cast<char*>(name), AnswerKind::kPlain, false};
  }
  // Make changes that the outbox must accept.
  void change(twr_session& session, SessionChange change, PendingReply reply) {
    EXPECT_EQ(outbox->change(session, std::move(change), reply), TWR_OK);
  }
  void destroy(twr_session& session, PendingReply reply) {
    EXPECT_EQ(outbox->destroy(session, reply), TWR_OK);
  }
  twr_status send(twr_session& to, std::int64_t number, PendingReply reply = {}) {
    return outbox->send(&to, message(number), {&to.identifier, 1}, reply);
  }
  RingMessage message(std::int64_t number) {
    twr_payload_init(&payload, memory.data(), memory.size());
    twr_put_int(&payload, "n", number);
    twr_put_double(&payload, "twreporting_timestamp", 1);
    return {14, 0, 1, 0, payload.entries, {payload.bytes, payload.size}};
  }
  twr_status push(twr_sender& sender, std::int64_t number) {
    message(number);
    return sender.ring.push(14, 0, payload);
  }

  twr_status pushLarge(twr_sender& sender, std::size_t bytes, std::int64_t number = 0) {
    message(number);
    twr_put_text(&payload, "text", std::string(bytes, 'x').c_str());
    return sender.ring.push(14, 0, payload);
  }

  static std::string said(int number, const std::string& more = "", std::int64_t identifier = 77) {
    return "sendMessage {\"n\":" + std::to_string(number) + ",\"twreporting_timestamp\":1.0" + more +
           "} 14 0 [" + std::to_string(identifier) + "]";
  }

  // Reads the frames in `bytes`.
  std::vector<RpcFrame> framesOf(std::string_view bytes) {
    std::vector<RpcFrame> frames;
    RpcStrings texts;
    RpcFrameReader reader(texts);
    while (reader.next(bytes) == RpcFrameReader::Result::kFrame) frames.push_back(reader.frame());
    EXPECT_EQ(reader.problem(), "");
    return frames;
  }
  // Sends everything, and returns the frames' texts.
  std::vector<std::string> sayAll() {
    std::vector<std::string> texts;
    for (;;) {
      const std::string bytes(outbox->unsent());
      for (RpcFrame& frame : framesOf(bytes)) {
        if (frame.kind == RpcFrame::Kind::kRequest) requests[frame.method] = frame.identifier;
        texts.push_back(textOf(frame));
      }
      outbox->sent(bytes.size());
      if (bytes.empty()) return texts;
    }
  }
  // Sends up to `most` bytes, and calls `take` with each frame that is complete then. False when there was
  // nothing to send.
  template <class Take>
  bool saySome(std::size_t most, Take take) {
    const std::string bytes(outbox->unsent());
    const std::size_t count = std::min(most, bytes.size());
    arriving += bytes.substr(0, count);
    outbox->sent(count);
    std::size_t used = 0;
    for (const RpcFrame& frame : framesOf(arriving)) {
      take(frame);
      used += frame.wireBytes;
    }
    arriving.erase(0, used);
    return !bytes.empty();
  }
  void answer(const std::string& method) {
    RpcFrame response;
    response.kind = RpcFrame::Kind::kResponse;
    response.identifier = requests.at(method);
    response.result = Value(true);
    outbox->answered(response);
  }
  // The callbacks and their statuses since the last call.
  std::vector<std::string> told() {
    std::vector<std::string> all;
    for (const Delivery& delivery : std::exchange(deliveries, {})) {
      all.push_back(std::string(static_cast<const char*>(delivery.reply.context)) + ": " +
                    twr_status_text(delivery.answer->as(delivery.reply.kind).status));
    }
    return all;
  }
  void makeOutbox(std::size_t queueBytes) {
    outbox.reset();
    outbox = std::make_unique<ClientOutbox>(queueBytes, deliveries);
  }
  void reconnect() {
    outbox->disconnected();
    outbox->connected();
  }

  std::vector<unsigned char> memory = std::vector<unsigned char>(1024);
  twr_payload payload;
  Deliveries deliveries;
  ClientEngine engine{ClientSettings()};
  std::atomic<bool> hasForked{false};
  std::unique_ptr<ClientOutbox> outbox = std::make_unique<ClientOutbox>(65536, deliveries);
  std::map<std::string, std::uint32_t> requests;
  std::string arriving;
};

TEST_F(ClientOutboxTest, MakesSessionsAgainAsTheyWere) {
  const auto one = session();
  change(*one, type(7), {});
  change(*one, configuration({{"a", 1}, {"b", 1}}), {});
  change(*one, configuration({{"b", 2}}), {});
  change(*one, make(Kind::kStart), {});
  session(78);
  outbox->connected();
  EXPECT_EQ(sayAll().size(), 6U);
  reconnect();
  send(*one, 1);
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "setServiceType 7 77",
                                    "setConfiguration {\"a\":1,\"b\":2} 77", "startReportingSessionForID 77",
                                    "createReportingSession 78", said(1)));
}

TEST_F(ClientOutboxTest, MakesNoSessionAgainThatIsGoneOrStartsOneThatWasStopped) {
  const auto one = session();
  const auto other = session(78);
  for (const auto& each : {one, other}) change(*each, make(Kind::kStart), {});
  outbox->connected();
  destroy(*one, {});
  change(*other, make(Kind::kStop), {});
  sayAll();
  reconnect();
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 78"));
}

TEST_F(ClientOutboxTest, StartsNoSessionAgainThatAnotherTypeHasStopped) {
  const auto one = session();
  change(*one, make(Kind::kStart), {});
  change(*one, type(3), {});
  outbox->connected();
  sayAll();
  reconnect();
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "setServiceType 3 77"));
}

TEST_F(ClientOutboxTest, SendsAFrameAgainWhoseLastByteHadNotGoneOut) {
  const auto one = session();
  send(*one, 1);
  send(*one, 2);
  outbox->connected();
  const std::string bytes(outbox->unsent());
  // All bytes except the last one: one message is sent, and the other is not.
  const std::size_t create = framesOf(bytes)[0].wireBytes;
  const std::size_t first = framesOf(bytes)[1].wireBytes;
  outbox->sent(create + first);
  outbox->sent(bytes.size() - create - first - 1);
  reconnect();
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", said(2)));
  EXPECT_EQ(outbox->messagesSent(), 2U);
  EXPECT_EQ(outbox->queuedBytes(), 0U);
}

TEST_F(ClientOutboxTest, KnowsNothingOfAChangeThatHasNotGoneOut) {
  const auto one = session();
  change(*one, type(7), {});
  change(*one, make(Kind::kStart), {});
  outbox->connected();
  const std::string bytes(outbox->unsent());
  outbox->sent(1);
  EXPECT_EQ(framesOf(bytes).size(), 3U);
  reconnect();
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "setServiceType 7 77",
                                    "startReportingSessionForID 77"));
}

TEST_F(ClientOutboxTest, KeepsAStartsReplyOverAReconnect) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("start"));
  send(*one, 1, reply("send"));
  outbox->connected();
  sayAll();
  reconnect();
  EXPECT_THAT(told(), ElementsAre("send: not connected to the daemon"));
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "startReportingSessionForID 77 ?"));
  answer("startReportingSessionForID");
  EXPECT_THAT(told(), ElementsAre("start: done"));
}

TEST_F(ClientOutboxTest, CallsAStartsReplyWhenItsStopWasLost) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("start"));
  change(*one, make(Kind::kStop), reply("stop"));
  outbox->connected();
  sayAll();
  reconnect();
  EXPECT_THAT(told(), ElementsAre("stop: not connected to the daemon", "start: not connected to the daemon"));
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77"));
}

TEST_F(ClientOutboxTest, KeepsAStartAndItsStopThatHadNotGoneOut) {
  const auto one = session();
  outbox->connected();
  sayAll();
  change(*one, make(Kind::kStart), reply("start"));
  change(*one, make(Kind::kStart), reply("again"));
  change(*one, make(Kind::kStop), reply("stop"));
  const std::string bytes(outbox->unsent());
  EXPECT_EQ(framesOf(bytes).size(), 3U);
  reconnect();
  EXPECT_THAT(told(), IsEmpty());
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "startReportingSessionForID 77 ?",
                                    "startReportingSessionForID 77", "stopReportingSessionForID 77 ?"));
  answer("startReportingSessionForID");
  answer("stopReportingSessionForID");
  EXPECT_THAT(told(), ElementsAre("start: done", "again: done", "stop: done"));
}

TEST_F(ClientOutboxTest, CallsTheReplyOfASecondStartWithTheFirst) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("first"));
  change(*one, make(Kind::kStart), reply("second"));
  outbox->connected();
  // The daemon answers only the first start.
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "startReportingSessionForID 77 ?",
                                    "startReportingSessionForID 77"));
  answer("startReportingSessionForID");
  EXPECT_THAT(told(), ElementsAre("first: done", "second: done"));
}

TEST_F(ClientOutboxTest, CallsAStartsReplyWithTheStopsAnswerIfTheStartIsNotAnswered) {
  const auto one = session();
  change(*one, make(Kind::kStart), {});
  change(*one, make(Kind::kStart), reply("start"));
  change(*one, make(Kind::kStop), {});
  outbox->connected();
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "startReportingSessionForID 77",
                                    "startReportingSessionForID 77", "stopReportingSessionForID 77 ?"));
  answer("stopReportingSessionForID");
  EXPECT_THAT(told(), ElementsAre("start: done"));
}

TEST_F(ClientOutboxTest, CallsAStartsReplyWhenTheSessionIsDestroyed) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("start"));
  destroy(*one, reply("destroy"));
  outbox->connected();
  sayAll();
  answer("destroyReportingSession");
  EXPECT_THAT(told(), ElementsAre("start: done", "destroy: done"));
}

TEST_F(ClientOutboxTest, CallsAStartsReplyWhenTheTypeChanges) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("start"));
  change(*one, type(7), {});
  outbox->connected();
  sayAll();
  answer("setServiceType");
  EXPECT_THAT(told(), ElementsAre("start: done"));
}

TEST_F(ClientOutboxTest, CallsTheStartsReplyOfTheRunThatEndedAndNotOfTheNext) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("first"));
  change(*one, make(Kind::kStop), {});
  change(*one, make(Kind::kStart), reply("second"));
  outbox->connected();
  sayAll();
  answer("stopReportingSessionForID");
  EXPECT_THAT(told(), ElementsAre("first: done"));
  outbox->end();
  EXPECT_THAT(told(), ElementsAre("second: not connected to the daemon"));
}

TEST_F(ClientOutboxTest, IgnoresAnAnswerToNoRequest) {
  requests["nothing"] = 4711;
  answer("nothing");
  EXPECT_THAT(told(), IsEmpty());
}

// The request is sent again after the connection has broken. Its caller may have freed the context by then.
TEST_F(ClientOutboxTest, CallsAReplyOnceWhenTheDaemonAnswersWhatItCannotHaveRead) {
  const auto one = session();
  outbox->connected();
  sayAll();
  change(*one, make(Kind::kStart), reply("start"));
  change(*one, configuration({{"a", 1}}), reply("configuration"));
  for (const RpcFrame& frame : framesOf(outbox->unsent())) {
    if (frame.kind == RpcFrame::Kind::kRequest) requests[frame.method] = frame.identifier;
  }
  answer("startReportingSessionForID");
  answer("setConfiguration");
  EXPECT_THAT(told(), ElementsAre("start: done", "configuration: done"));
  reconnect();
  sayAll();
  outbox->end();
  EXPECT_THAT(told(), IsEmpty());
}

// The answer to the end of a run answers the start, too.
TEST_F(ClientOutboxTest, CallsAStartsReplyOnceWhenTheDaemonAnswersAnEndThatItCannotHaveRead) {
  const auto one = session();
  outbox->connected();
  sayAll();
  change(*one, make(Kind::kStart), reply("start"));
  destroy(*one, reply("destroy"));
  for (const RpcFrame& frame : framesOf(outbox->unsent())) {
    if (frame.kind == RpcFrame::Kind::kRequest) requests[frame.method] = frame.identifier;
  }
  answer("destroyReportingSession");
  EXPECT_THAT(told(), ElementsAre("start: done", "destroy: done"));
  reconnect();
  sayAll();
  outbox->end();
  EXPECT_THAT(told(), IsEmpty());
}

// Otherwise a queue of small requests would take a multiple of its bound.
TEST_F(ClientOutboxTest, CountsTheMemoryOfWhatWaitsAndNotOnlyItsBytes) {
  const auto one = session();
  const std::size_t ofTheSession = outbox->queuedBytes();
  EXPECT_GE(ofTheSession, sizeof(Command));
  EXPECT_EQ(outbox->request("", {}), TWR_OK);
  const std::size_t ofTheRequest = outbox->queuedBytes() - ofTheSession;
  EXPECT_GE(ofTheRequest, sizeof(Command));
  EXPECT_EQ(send(*one, 1), TWR_OK);
  EXPECT_GE(outbox->queuedBytes() - ofTheSession - ofTheRequest, sizeof(Command) + payload.size);
}

TEST_F(ClientOutboxTest, DropsMessagesPastItsBoundAndSaysHowMany) {
  makeOutbox(1000);
  const auto one = session();
  int sent = 0;
  while (send(*one, sent) == TWR_OK) ++sent;
  EXPECT_GT(sent, 0);
  EXPECT_EQ(send(*one, 99), TWR_FULL);
  EXPECT_EQ(outbox->messagesDropped(), 2U);
  outbox->connected();
  EXPECT_EQ(sayAll().size(), 1U + static_cast<std::size_t>(sent));
  EXPECT_EQ(send(*one, 5), TWR_OK);
  EXPECT_EQ(send(*one, 6), TWR_OK);
  EXPECT_THAT(sayAll(), ElementsAre(said(5, ",\"twreporting_dropped\":2"), said(6)));
}

TEST_F(ClientOutboxTest, CountsWhatWasDroppedOfASessionForThatSessionAlone) {
  makeOutbox(1000);
  const auto one = session();
  const auto other = session(78);
  while (send(*one, 1) == TWR_OK) {
  }
  outbox->connected();
  sayAll();
  send(*other, 1);
  EXPECT_THAT(sayAll(), ElementsAre(said(1, "", 78)));
}

TEST_F(ClientOutboxTest, KeepsRoomForChangesBeyondMessages) {
  makeOutbox(1000);
  const auto one = session();
  while (send(*one, 1) == TWR_OK) {
  }
  EXPECT_EQ(outbox->change(*one, make(Kind::kStart), reply("start")), TWR_OK);
  outbox->connected();
  EXPECT_EQ(sayAll().back(), "startReportingSessionForID 77 ?");
}

TEST_F(ClientOutboxTest, MakesChangesLaterThatFoundNoRoom) {
  const auto one = session();
  while (outbox->queuedBytes() < 65536 + CommandQueue::kReserveBytes - kCommandBytes)
    change(*one, type(1), {});
  EXPECT_EQ(outbox->change(*one, type(9), {}), TWR_OK);
  EXPECT_EQ(outbox->change(*one, configuration({{"a", 1}}), {}), TWR_OK);
  EXPECT_EQ(outbox->change(*one, make(Kind::kStart), reply("start")), TWR_FULL);
  outbox->connected();
  std::vector<std::string> all = sayAll();
  all.erase(std::remove(all.begin(), all.end(), "setServiceType 1 77"), all.end());
  EXPECT_THAT(all, ElementsAre("createReportingSession 77", "setServiceType 9 77",
                               "setConfiguration {\"a\":1} 77", "startReportingSessionForID 77"));
  EXPECT_EQ(outbox->queuedBytes(), 0U);
  outbox->end();
  EXPECT_THAT(told(), IsEmpty());
}

TEST_F(ClientOutboxTest, ForgetsASessionThatWasMadeAndDestroyedWithoutRoom) {
  const auto one = session();
  while (outbox->queuedBytes() < 65536 + CommandQueue::kReserveBytes - kCommandBytes)
    change(*one, type(1), {});
  const std::size_t before = outbox->queuedBytes();
  for (int at = 0; at < 10'000; ++at) EXPECT_EQ(outbox->destroy(*session(78), {}), TWR_OK);
  EXPECT_EQ(outbox->queuedBytes(), before);
  outbox->connected();
  const std::vector<std::string> all = sayAll();
  EXPECT_EQ(std::count(all.begin(), all.end(), "createReportingSession 78"), 0);
}

TEST_F(ClientOutboxTest, BoundsTheRepliesThatWait) {
  makeOutbox(64 * ClientOutbox::kBytesPerReply);
  const auto one = session();
  outbox->connected();
  int taken = 0;
  for (; taken < 1000 && send(*one, 1, reply("send")) == TWR_OK; ++taken) sayAll();
  EXPECT_EQ(taken, 64);
  EXPECT_EQ(send(*one, 1), TWR_OK);
  answer("sendMessage");
  EXPECT_EQ(send(*one, 1, reply("send")), TWR_OK);
}

TEST_F(ClientOutboxTest, SendsWhatIsInARingBeforeWhatTheSessionIsAskedForLater) {
  const auto one = session();
  const auto sender = outbox->openSender(*one, hasForked, 4096);
  outbox->connected();
  push(*sender, 1);
  change(*one, make(Kind::kStart), {});
  push(*sender, 2);
  send(*one, 3);
  push(*sender, 4);
  change(*one, make(Kind::kStop), {});
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", said(1), "startReportingSessionForID 77",
                                    said(2), said(3), said(4), "stopReportingSessionForID 77"));
}

TEST_F(ClientOutboxTest, SendsWhatIsInARingAfterWhatTheSessionWasAskedForBefore) {
  const auto one = session();
  const auto sender = outbox->openSender(*one, hasForked, 4096);
  change(*one, make(Kind::kStart), {});
  push(*sender, 1);
  outbox->connected();
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", "startReportingSessionForID 77", said(1)));
}

TEST_F(ClientOutboxTest, TakesARingsMessagesBackThatHadNotGoneOut) {
  const auto one = session();
  outbox->connected();
  sayAll();
  const auto sender = outbox->openSender(*one, hasForked, 4096);
  push(*sender, 1);
  push(*sender, 2);
  const std::string bytes(outbox->unsent());
  outbox->sent(framesOf(bytes)[0].wireBytes + 5);
  reconnect();
  push(*sender, 3);
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", said(2), said(3)));
  EXPECT_EQ(outbox->messagesSent(), 3U);
  EXPECT_EQ(outbox->queuedBytes(), 0U);
}

TEST_F(ClientOutboxTest, SendsAClosedSendersMessagesAndItsLoss) {
  const auto one = session();
  outbox->connected();
  const auto sender = outbox->openSender(*one, hasForked, 128);
  EXPECT_EQ(push(*sender, 1), TWR_OK);
  EXPECT_EQ(push(*sender, 2), TWR_FULL);
  outbox->closeSender(*sender);
  change(*one, make(Kind::kStop), {});
  const std::vector<std::string> all = sayAll();
  ASSERT_EQ(all.size(), 4U);
  EXPECT_EQ(all[1], said(1));
  EXPECT_THAT(all[2], testing::HasSubstr("\"twreporting_dropped\":1"));
  EXPECT_THAT(all[2], testing::HasSubstr(" 14 65535 [77]"));
  EXPECT_EQ(all[3], "stopReportingSessionForID 77");
  EXPECT_FALSE(outbox->hasSenders());
  EXPECT_EQ(outbox->messagesDropped(), 1U);
}

// A flush after the close had a mark of the removed sender, which was then removed a second time.
TEST_F(ClientOutboxTest, CountsAClosedSendersLossOnce) {
  const auto one = session();
  outbox->connected();
  sayAll();
  const auto sender = outbox->openSender(*one, hasForked, 128);
  push(*sender, 1);
  EXPECT_EQ(push(*sender, 2), TWR_FULL);
  outbox->closeSender(*sender);
  outbox->addBarrier(std::make_shared<Waiter>());
  EXPECT_EQ(sayAll().size(), 2U);
  EXPECT_EQ(outbox->messagesDropped(), 1U);
}

TEST_F(ClientOutboxTest, KeepsWhatAClosedSenderLeavesWithoutADaemonInItsPlace) {
  const auto one = session();
  const auto sender = outbox->openSender(*one, hasForked, 128);
  push(*sender, 1);
  change(*one, make(Kind::kStart), {});
  EXPECT_EQ(push(*sender, 2), TWR_FULL);
  outbox->closeSender(*sender);
  EXPECT_FALSE(outbox->hasSenders());
  destroy(*one, {});
  outbox->connected();
  const std::vector<std::string> all = sayAll();
  ASSERT_EQ(all.size(), 5U);
  EXPECT_EQ(all[1], said(1));
  EXPECT_EQ(all[2], "startReportingSessionForID 77");
  EXPECT_THAT(all[3], testing::HasSubstr("\"twreporting_dropped\":1"));
  EXPECT_EQ(all[4], "destroyReportingSession 77");
}

// This holds with and without an earlier connection.
TEST_F(ClientOutboxTest, KeepsAClosedSendersMessagesThatFitTheQueueAndReportsTheRestAtItsPlace) {
  for (const bool wasConnected : {false, true}) {
    SCOPED_TRACE(wasConnected ? "a connection broke" : "there was none yet");
    makeOutbox(2800);
    const auto one = session();
    if (wasConnected) outbox->connected();
    const auto sender = outbox->openSender(*one, hasForked, 4096);
    push(*sender, 1);
    pushLarge(*sender, 700);
    push(*sender, 2);
    pushLarge(*sender, 700);  // one too many
    push(*sender, 3);
    pushLarge(*sender, 600);  // two too many
    outbox->closeSender(*sender);
    if (wasConnected) outbox->disconnected();
    EXPECT_FALSE(outbox->hasSenders());
    EXPECT_EQ(outbox->messagesDropped(), 2U);
    EXPECT_EQ(send(*one, 4), TWR_FULL);
    outbox->connected();
    std::vector<std::string> all = sayAll();
    ASSERT_EQ(all.size(), 6U);
    EXPECT_EQ(all[1], said(1));
    EXPECT_THAT(all[2], testing::Not(testing::HasSubstr("twreporting_dropped")));
    EXPECT_EQ(all[3], said(2));
    EXPECT_EQ(all[4], said(3, ",\"twreporting_dropped\":1"));
    EXPECT_THAT(all[5], testing::HasSubstr("\"twreporting_dropped\":1"));
    EXPECT_THAT(all[5], testing::HasSubstr(" 14 65535 [77]"));
    send(*one, 5);
    EXPECT_THAT(sayAll(), ElementsAre(said(5, ",\"twreporting_dropped\":1")));
  }
}

TEST_F(ClientOutboxTest, ReportsALossWithTheFirstMessageAfterItOfTheSessionOrASender) {
  const auto one = session();
  outbox->connected();
  const auto sender = outbox->openSender(*one, hasForked, 128);
  push(*sender, 1);
  EXPECT_EQ(push(*sender, 2), TWR_FULL);
  EXPECT_EQ(push(*sender, 3), TWR_FULL);
  send(*one, 4);
  EXPECT_THAT(sayAll(),
              ElementsAre("createReportingSession 77", said(1), said(4, ",\"twreporting_dropped\":2")));
  push(*sender, 5);
  EXPECT_THAT(sayAll(), ElementsAre(said(5)));
}

// The first message of the ring reported losses of the queue that came long after it.
TEST_F(ClientOutboxTest, ReportsNoLossWithAnEarlierMessage) {
  makeOutbox(4096);
  const auto one = session();
  const auto sender = outbox->openSender(*one, hasForked, TWR_DEFAULT_RING_BYTES);
  std::vector<std::string> expected{"createReportingSession 77"};
  int lost = 0;
  for (int number = 1; number <= 400; ++number) {
    const bool isTaken = (number % 3 == 0 ? push(*sender, number) : send(*one, number)) == TWR_OK;
    if (isTaken) {
      expected.push_back(said(number, lost == 0 ? "" : ",\"twreporting_dropped\":" + std::to_string(lost)));
    }
    lost = isTaken ? 0 : lost + 1;
  }
  ASSERT_GT(expected.size(), 140U);
  outbox->connected();
  EXPECT_EQ(sayAll(), expected);
}

TEST_F(ClientOutboxTest, ReportsALossOfOneSenderAmongAnothersMessages) {
  for (const bool lostFirst : {false, true}) {
    const auto one = session();
    outbox->connected();
    sayAll();
    auto losing = outbox->openSender(*one, hasForked, 128);
    auto other = outbox->openSender(*one, hasForked, 4096);
    if (lostFirst) std::swap(one->senders[0], one->senders[1]);
    push(*other, 1);
    push(*losing, 2);
    EXPECT_EQ(push(*losing, 3), TWR_FULL);
    push(*other, 4);
    destroy(*one, {});
    std::vector<std::string> all = sayAll();
    ASSERT_EQ(all.size(), 4U);
    EXPECT_EQ(all.back(), "destroyReportingSession 77");
    EXPECT_EQ(std::count(all.begin(), all.end(), said(1)), 1);
    EXPECT_EQ(std::count(all.begin(), all.end(), said(2)), 1);
    EXPECT_EQ(std::count(all.begin(), all.end(), said(4, ",\"twreporting_dropped\":1")), 1);
  }
}

// Messages are taken or dropped by the session or its sender, at the call or when a closed sender's ring
// moves to the queue. Few or many bytes are sent at a time, and the connection breaks anywhere.
TEST_F(ClientOutboxTest, ReportsEveryLossAtItsPlaceHoweverMessagesMix) {
  for (unsigned seed = 0; seed < 100; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    std::mt19937 random(seed);
    const auto below = [&](std::size_t bound) { return static_cast<std::size_t>(random() % bound); };
    makeOutbox(seed % 2 == 0 ? 2000 : 5000);
    const auto one = session();
    std::shared_ptr<twr_sender> sender;
    bool isConnected = false;
    // The numbers of the messages that arrived, and how many losses were reported by then. A message with the
    // number 0 only reports losses.
    std::vector<std::pair<std::int64_t, std::uint64_t>> arrived;
    std::uint64_t told = 0;
    const auto take = [&](const RpcFrame& frame) {
      if (frame.method != "sendMessage") return;
      const ValueMap& message = *frame.arguments[0]->asMap();
      told += static_cast<std::uint64_t>(message.integer("twreporting_dropped"));
      arrived.emplace_back(message.integer("n"), told);
    };
    std::int64_t number = 0;
    for (int step = 0; step < 400; ++step) {
      const std::size_t action = below(20);
      if (action < 6) {
        send(*one, ++number);
      } else if (action < 14) {
        if (sender == nullptr) sender = outbox->openSender(*one, hasForked, std::size_t{256} << below(3));
        below(4) == 0 ? pushLarge(*sender, below(300), ++number) : push(*sender, ++number);
      } else if (action == 14 && sender != nullptr) {
        outbox->closeSender(*sender);
        sender = nullptr;
      } else if (action == 15) {
        if (isConnected) outbox->disconnected();
        isConnected = false;
      } else if (action >= 18) {
        if (!isConnected) arriving.clear(), outbox->connected();
        isConnected = true;
        saySome(below(1000), take);
      }
    }
    if (!isConnected) arriving.clear(), outbox->connected();
    destroy(*one, {});
    while (saySome(1000, take)) {
    }
    std::int64_t last = 0;
    std::uint64_t lostBefore = 0;
    for (const auto& [at, toldWithIt] : arrived) {
      if (at == 0) continue;
      ASSERT_GT(at, last);
      lostBefore += static_cast<std::uint64_t>(at - last - 1);
      ASSERT_EQ(toldWithIt, lostBefore) << "with message " << at;
      last = at;
    }
    ASSERT_EQ(told, lostBefore + static_cast<std::uint64_t>(number - last));
    ASSERT_EQ(told, outbox->messagesDropped());
  }
}

TEST_F(ClientOutboxTest, ClosesItsSendersWithASession) {
  const auto one = session();
  outbox->connected();
  const auto sender = outbox->openSender(*one, hasForked, 4096);
  push(*sender, 1);
  destroy(*one, {});
  EXPECT_THAT(sayAll(), ElementsAre("createReportingSession 77", said(1), "destroyReportingSession 77"));
  EXPECT_FALSE(outbox->hasSenders());
}

TEST_F(ClientOutboxTest, BoundsWhatClosedSendersHoldWhileNothingGoesOut) {
  const auto one = session();
  outbox->connected();
  sayAll();
  for (int at = 0; at < 3; ++at) {
    const auto sender = outbox->openSender(*one, hasForked, TWR_MOST_RING_BYTES / 2);
    push(*sender, at);
    outbox->closeSender(*sender);
  }
  EXPECT_FALSE(outbox->hasSenders());
  EXPECT_THAT(sayAll(), ElementsAre(said(0), said(1), said(2)));
}

TEST_F(ClientOutboxTest, BoundsItsSenders) {
  const auto one = session();
  for (std::size_t at = 0; at < ClientOutbox::kMaxSenders; ++at)
    ASSERT_NE(outbox->openSender(*one, hasForked, 64), nullptr);
  EXPECT_EQ(outbox->openSender(*one, hasForked, 64), nullptr);
}

TEST_F(ClientOutboxTest, FinishesABarrierWhenAllBeforeIsOut) {
  const auto one = session();
  const auto sender = outbox->openSender(*one, hasForked, 4096);
  outbox->connected();
  push(*sender, 1);
  const auto waiter = std::make_shared<Waiter>();
  outbox->addBarrier(waiter);
  const std::string bytes(outbox->unsent());
  EXPECT_EQ(framesOf(bytes).size(), 2U);
  outbox->sent(bytes.size() - 1);
  EXPECT_FALSE(waiter->isDone);
  outbox->sent(1);
  EXPECT_TRUE(waiter->isDone);
  EXPECT_EQ(waiter->status, TWR_OK);
}

TEST_F(ClientOutboxTest, CallsAllRepliesAtTheEnd) {
  const auto one = session();
  change(*one, make(Kind::kStart), reply("start"));
  outbox->connected();
  sayAll();
  change(*one, type(5), reply("type"));
  EXPECT_EQ(outbox->request("\xA1m\x90", reply("request")), TWR_OK);
  const auto waiter = std::make_shared<Waiter>();
  outbox->addBarrier(waiter);
  outbox->end();
  EXPECT_THAT(told(), testing::UnorderedElementsAre("start: not connected to the daemon",
                                                    "type: not connected to the daemon",
                                                    "request: not connected to the daemon"));
  EXPECT_EQ(waiter->status, TWR_NOT_CONNECTED);
  EXPECT_EQ(outbox->change(*one, type(6), reply("late")), TWR_NOT_CONNECTED);
  EXPECT_EQ(send(*one, 1), TWR_NOT_CONNECTED);
  EXPECT_EQ(outbox->request("", {}), TWR_NOT_CONNECTED);
  EXPECT_EQ(outbox->destroy(*one, {}), TWR_NOT_CONNECTED);
  EXPECT_THAT(told(), IsEmpty());
}

// Keeps the sessions and messages that a daemon knows after the frames that it gets.
class ModelDaemon {
 public:
  void newConnection() { sessions_.clear(); }
  void take(const RpcFrame& frame) {
    const auto identifier = [&](std::size_t place) { return frame.arguments[place]->integer(); };
    if (frame.method == "createReportingSession")
      sessions_[identifier(0)] = {true, TWR_SERVICE_UNKNOWN, {}, false};
    if (frame.method == "destroyReportingSession") sessions_.erase(identifier(0));
    if (frame.method == "startReportingSessionForID") known(identifier(0)).isStarted = true;
    if (frame.method == "stopReportingSessionForID") known(identifier(0)).isStarted = false;
    if (frame.method == "setServiceType")
      known(identifier(1)).apply({Kind::kServiceType, static_cast<std::uint16_t>(identifier(0)), {}});
    if (frame.method == "setConfiguration")
      known(identifier(1)).configuration.merge(*frame.arguments[0]->asMap());
    if (frame.method != "sendMessage") return;
    const ValueMap& message = *frame.arguments[0]->asMap();
    messages_[frame.arguments[3]->asArray()->begin()->integer()].push_back(message.integer("n"));
    toldDropped_ += static_cast<std::uint64_t>(message.integer("twreporting_dropped"));
  }
  SessionState& known(std::int64_t identifier) {
    EXPECT_TRUE(sessions_.contains(identifier)) << "the daemon knows no session " << identifier;
    return sessions_[identifier];
  }
  const std::map<std::int64_t, SessionState>& sessions() const { return sessions_; }
  std::map<std::int64_t, std::vector<std::int64_t>>& messages() { return messages_; }
  std::uint64_t toldDropped() const { return toldDropped_; }

 private:
  std::uint64_t toldDropped_ = 0;
  std::map<std::int64_t, SessionState> sessions_;
  std::map<std::int64_t, std::vector<std::int64_t>> messages_;
};

// The calls, the number of bytes sent at a time, and the places where the connection breaks are random. In
// the end the daemon has the sessions in the state that was requested last, and every message once and in
// order.
TEST_F(ClientOutboxTest, LeadsTheDaemonToTheWantedStateHoweverTheConnectionBreaks) {
  for (unsigned seed = 0; seed < 150; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    std::mt19937 random(seed);
    const auto below = [&](std::size_t bound) { return static_cast<std::size_t>(random() % bound); };
    // Every third run has so little room that changes are sent late and messages are dropped.
    const bool isTight = seed % 3 == 0;
    makeOutbox(isTight ? 1 : std::size_t{1} << 20U);
    ModelDaemon daemon;
    std::vector<std::shared_ptr<twr_session>> sessions;
    std::map<std::int64_t, std::vector<std::int64_t>> accepted;
    std::map<twr_session*, std::shared_ptr<twr_sender>> senders;
    std::int64_t next = 100;
    bool isConnected = false;
    const auto sendSome = [&](std::size_t most) {
      return saySome(most, [&](const RpcFrame& frame) { daemon.take(frame); });
    };
    const auto connect = [&] {
      daemon.newConnection();
      arriving.clear();
      outbox->connected();
      isConnected = true;
    };
    for (int step = 0; step < 300; ++step) {
      if (isTight && below(40) == 0) {
        std::string filler;
        RpcWriter(filler).body("filler", {Value(std::string(CommandQueue::kReserveBytes - 1000, 'x'))});
        (void)outbox->request(std::move(filler), {});  // may find no room
      }
      const std::size_t action = below(16);
      if (action == 0 || sessions.empty()) {
        sessions.push_back(session(next++));
        continue;
      }
      const std::shared_ptr<twr_session> one = sessions[below(sessions.size())];
      const std::int64_t number = next++;
      if (action == 1) {
        // TWR_FULL would only mean that the reply found no room. The change is made.
        (void)outbox->destroy(*one, below(2) == 0 ? reply("d") : PendingReply());
        senders.erase(one.get());
        std::erase(sessions, one);
      } else if (action <= 3) {
        change(*one, type(static_cast<std::uint16_t>(below(3))), {});
      } else if (action == 4) {
        change(*one, configuration({{std::string(1, static_cast<char>('a' + below(3))), number}}), {});
      } else if (action <= 6) {
        (void)outbox->change(*one, make(Kind::kStart), below(2) == 0 ? reply("s") : PendingReply());
      } else if (action == 7) {
        change(*one, make(Kind::kStop), {});
      } else if (action <= 9) {
        if (send(*one, number) == TWR_OK) accepted[one->identifier].push_back(number);
      } else if (action == 10) {
        std::shared_ptr<twr_sender>& sender = senders[one.get()];
        if (sender == nullptr) {
          sender = outbox->openSender(*one, hasForked, 1024);
        } else {
          outbox->closeSender(*sender);
          senders.erase(one.get());
        }
      } else if (action <= 12) {
        const auto sender = senders.find(one.get());
        if (sender != senders.end() && push(*sender->second, number) == TWR_OK)
          accepted[one->identifier].push_back(number);
      } else if (action == 13) {
        if (isConnected) outbox->disconnected();
        isConnected = false;
      } else {
        if (!isConnected) connect();
        sendSome(below(isTight ? 20'000 : 200));
      }
    }
    if (!isConnected) connect();
    const auto sendAll = [&] {
      while (sendSome(isTight ? 10'000 : 100)) {
      }
    };
    sendAll();
    ASSERT_EQ(outbox->queuedBytes(), 0U);
    ASSERT_EQ(daemon.sessions().size(), sessions.size());
    for (const std::shared_ptr<twr_session>& one : sessions) {
      const SessionState& state = daemon.known(one->identifier);
      EXPECT_EQ(state.serviceType, one->wanted.serviceType);
      EXPECT_EQ(state.isStarted, one->wanted.isStarted);
      EXPECT_EQ(state.configuration, one->wanted.configuration);
    }
    for (auto& [identifier, numbers] : daemon.messages())
      std::erase(numbers, 0);  // messages that only report losses
    std::erase_if(daemon.messages(), [](const auto& entry) { return entry.second.empty(); });
    if (!isTight) {
      EXPECT_EQ(daemon.messages(), accepted);
    }
    // The sessions' ends report the losses that no message has reported. Nothing is reported of a session
    // that the daemon never knew, which needs a queue without any room.
    for (const std::shared_ptr<twr_session>& one : sessions) destroy(*one, {});
    sendAll();
    EXPECT_LE(daemon.toldDropped(), outbox->messagesDropped());
    if (!isTight) {
      EXPECT_EQ(daemon.toldDropped(), outbox->messagesDropped());
    }
    if (HasFailure()) return;
  }
}

}  // namespace
}  // namespace tonewerk
