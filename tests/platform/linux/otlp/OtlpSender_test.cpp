// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpSender.h"

#include <gmock/gmock.h>
#include <zlib.h>

#include "platform/Log.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/ScriptedHttpClient.h"

namespace tonewerk {
namespace {

using std::chrono::duration;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using Urgency = OtlpOutbox::Urgency;

HttpAnswer answerOf(int status, std::string body = {}, std::string retryAfter = {}) {
  HttpAnswer answer;
  answer.status = status;
  answer.body = std::move(body);
  answer.retryAfter = std::move(retryAfter);
  return answer;
}

HttpAnswer noAnswer(const std::string& problem) {
  HttpAnswer answer;
  answer.problem = problem;
  return answer;
}

std::string unpacked(const std::string& packed) {
  std::string text(std::size_t{1} << 20, '\0');
  z_stream stream{};
  EXPECT_EQ(inflateInit2(&stream, 15 + 16), Z_OK);
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(packed.data()));
  stream.avail_in = static_cast<uInt>(packed.size());
  stream.next_out = reinterpret_cast<Bytef*>(text.data());
  stream.avail_out = static_cast<uInt>(text.size());
  EXPECT_EQ(inflate(&stream, Z_FINISH), Z_STREAM_END);
  text.resize(stream.total_out);
  inflateEnd(&stream);
  return text;
}

class OtlpSenderTest : public testing::Test {
 protected:
  void add(const std::string& record, Urgency urgency = Urgency::kAtOnce) {
    (void)outbox_.add("\"" + record + "\"", urgency, clock_.monotonic());  // some tests overfill the outbox
  }
  // Sends all due records. Returns the seconds until the next ones are due, or -1 if no records wait.
  double send() {
    const auto wait = sender_.sendDue();
    return wait ? duration<double>(*wait).count() : -1.0;
  }
  // The list of records in each request.
  std::vector<std::string> sent() const {
    std::vector<std::string> lists;
    for (const HttpRequest& request : client_.requests) {
      const std::string body = unpacked(request.body);
      const std::string before = R"("logRecords":[)";
      const std::size_t at = body.find(before) + before.size();
      lists.push_back(body.substr(at, body.find(']', at) - at));
    }
    return lists;
  }
  std::vector<std::string> errors() const { return log_.textsOf("twrs", LogLevel::kError); }

  ManualClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  OtlpOutbox outbox_{{}};
  ScriptedHttpClient client_;
  OtlpResource resource_{"n", "v", "h", ""};
  std::vector<SendingRow> ledger_;
  OtlpSender sender_{"http://fleet/v1/logs",
                     outbox_,
                     client_,
                     [this] { return resource_; },
                     [this](const SendingRow& sending) { ledger_.push_back(sending); },
                     clock_,
                     category_,
                     RetryPolicy([] { return 1.0; })};
};

TEST_F(OtlpSenderTest, SendsNothingWithoutRecords) {
  EXPECT_EQ(send(), -1.0);
  EXPECT_THAT(client_.requests, IsEmpty());
}

TEST_F(OtlpSenderTest, PostsPackedJson) {
  add("a");
  EXPECT_EQ(send(), -1.0);
  ASSERT_THAT(client_.requests, SizeIs(1));
  EXPECT_EQ(client_.requests[0].url, "http://fleet/v1/logs");
  EXPECT_THAT(client_.requests[0].headers,
              ElementsAre("Content-Type: application/json", "Content-Encoding: gzip"));
  EXPECT_THAT(sent(), ElementsAre("\"a\""));
  EXPECT_EQ(outbox_.count(), 0U);
}

TEST_F(OtlpSenderTest, BatchedRecordsGoTogetherAfterFiveSeconds) {
  add("a", Urgency::kBatched);
  clock_.advance(2.0);
  add("b", Urgency::kBatched);
  EXPECT_EQ(send(), 3.0);
  EXPECT_THAT(client_.requests, IsEmpty());
  clock_.advance(3.0);
  EXPECT_EQ(send(), -1.0);
  EXPECT_THAT(sent(), ElementsAre("\"a\",\"b\""));
}

TEST_F(OtlpSenderTest, GetsTheResourceForEveryRequest) {
  add("a");
  send();
  resource_.deviceIdentifier = "speaker-7";
  add("b");
  send();
  EXPECT_THAT(unpacked(client_.requests[0].body), testing::Not(HasSubstr("speaker-7")));
  EXPECT_THAT(unpacked(client_.requests[1].body), HasSubstr("speaker-7"));
}

TEST_F(OtlpSenderTest, TriesAgainLaterAndKeepsTheRecordsInOrder) {
  client_.answers = {noAnswer("refused"), answerOf(503), answerOf(429)};
  add("a");
  EXPECT_EQ(send(), 5.0);
  add("b");
  clock_.advance(4.9);
  EXPECT_NEAR(send(), 0.1, 1e-6);
  EXPECT_THAT(client_.requests, SizeIs(1));
  clock_.advance(0.1);
  EXPECT_EQ(send(), 7.5);
  clock_.advance(7.5);
  EXPECT_EQ(send(), 11.25);
  clock_.advance(11.25);
  EXPECT_EQ(send(), -1.0);
  EXPECT_THAT(sent(), ElementsAre("\"a\"", "\"a\"", "\"a\"", "\"a\"", "\"b\""));
}

TEST_F(OtlpSenderTest, SendsTheSameIdentifiersAgain) {
  client_.answers = {noAnswer("the answer did not come")};
  add("a");
  send();
  clock_.advance(5.0);
  send();
  EXPECT_EQ(unpacked(client_.requests[0].body), unpacked(client_.requests[1].body));
}

TEST_F(OtlpSenderTest, NeverGivesUpOnAnEndpointThatIsDown) {
  for (int n = 0; n < 1000; ++n) client_.answers.push_back(noAnswer("refused"));
  add("a");
  for (int n = 0; n < 1000; ++n) {
    EXPECT_GT(send(), 0.0);
    clock_.advance(30.0);
  }
  EXPECT_EQ(send(), -1.0);
  EXPECT_EQ(outbox_.count(), 0U);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("http://fleet/v1/logs: refused; records are kept"),
                                    HasSubstr("goes on; records dropped meanwhile: 0")));
}

TEST_F(OtlpSenderTest, TheLedgerHasEveryRequestAndWhatBecameOfItsRecords) {
  client_.answers = {
      noAnswer("refused"), answerOf(413), answerOf(400),
      answerOf(200, R"({"partialSuccess":{"rejectedLogRecords":"7","errorMessage":"old\nnews"}})")};
  add("a");
  add("b");
  const double first = clock_.now();
  EXPECT_EQ(send(), 5.0);
  clock_.advance(5.0);
  EXPECT_EQ(send(), -1.0);
  ASSERT_THAT(ledger_, SizeIs(4));
  ASSERT_THAT(client_.requests, SizeIs(4));
  using Sent = SendingFacts::Outcome;
  const std::vector<Sent> outcomes{Sent::kKept, Sent::kSplit, Sent::kDropped, Sent::kDelivered};
  const std::vector<std::uint64_t> records{2, 2, 1, 1};
  const std::vector<std::optional<int>> statuses{std::nullopt, 413, 400, 200};
  const std::vector<std::string> problems{"refused", "", "", "old?news"};
  for (std::size_t at = 0; at < 4; ++at) {
    EXPECT_EQ(ledger_[at].endpoint, "http://fleet/v1/logs");
    EXPECT_EQ(ledger_[at].facts.signal, "logs");
    EXPECT_EQ(ledger_[at].facts.sentAt, first + (at == 0 ? 0.0 : 5.0));
    EXPECT_EQ(ledger_[at].facts.records, records[at]);
    EXPECT_EQ(ledger_[at].facts.bytes, client_.requests[at].body.size());
    EXPECT_EQ(ledger_[at].facts.status, statuses[at]);
    EXPECT_EQ(ledger_[at].facts.outcome, outcomes[at]);
    EXPECT_EQ(ledger_[at].problem, problems[at]);
  }
  // It cannot have rejected more than it was sent.
  EXPECT_EQ(ledger_[3].facts.rejected, 1U);
  EXPECT_EQ(ledger_[2].facts.rejected, std::nullopt);
}

TEST_F(OtlpSenderTest, TheLedgerSaysWhatIsWrongWithAnAnswer) {
  HttpAnswer cut = answerOf(200, "{");
  cut.problem = "too long";
  client_.answers = {answerOf(200, "<html>"), cut,
                     answerOf(200, R"({"partialSuccess":{"rejectedLogRecords":-1}})")};
  for (const char* record : {"a", "b", "c"}) {
    add(record);
    EXPECT_EQ(send(), -1.0);
  }
  ASSERT_THAT(ledger_, SizeIs(3));
  EXPECT_EQ(ledger_[0].problem, "its answer cannot be read");
  EXPECT_EQ(ledger_[0].facts.rejected, std::nullopt);
  EXPECT_EQ(ledger_[1].problem, "its answer is not whole: too long");
  EXPECT_EQ(ledger_[2].problem, "");
  EXPECT_EQ(ledger_[2].facts.rejected, 0U);
}

TEST_F(OtlpSenderTest, SaysWhyTheLastSendingFailedUntilOneDoesNot) {
  EXPECT_EQ(sender_.problem(), "");
  client_.answers = {noAnswer("refused")};
  add("a");
  send();
  EXPECT_EQ(sender_.problem(), "refused; records are kept while there is room");
  clock_.advance(30.0);
  EXPECT_EQ(send(), -1.0);
  EXPECT_EQ(sender_.problem(), "");
}

TEST_F(OtlpSenderTest, WaitsAsLongAsTheEndpointAsks) {
  client_.answers = {answerOf(429, "", " 60\r\n"), answerOf(503, "", "Thu, 20 Nov 2025 10:20:00 GMT\r\n")};
  add("a");
  EXPECT_EQ(send(), 60.0);
  clock_.advance(60.0);
  EXPECT_EQ(send(), 60.0);
  clock_.advance(60.0);
  EXPECT_EQ(send(), -1.0);
}

TEST_F(OtlpSenderTest, DropsAndCountsRefusedRecordsAndLogsItOnce) {
  client_.answers = {answerOf(400), answerOf(400), answerOf(307), answerOf(500)};
  for (const char* record : {"a", "b", "c", "d", "e"}) {
    add(record);
    EXPECT_EQ(send(), -1.0);
  }
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("HTTP status 400; what it refuses is dropped"),
                                    HasSubstr("HTTP status 307"), HasSubstr("HTTP status 500"),
                                    HasSubstr("goes on; records dropped meanwhile: 4")));
  sender_.logLosses();
  EXPECT_THAT(errors().back(), HasSubstr("dropped in all: 4"));
}

TEST_F(OtlpSenderTest, SendsTooLargeBatchesInHalves) {
  client_.answers = {answerOf(413), answerOf(413), answerOf(200), answerOf(413)};
  for (const char* record : {"a", "b", "c", "d", "e"}) add(record);
  EXPECT_EQ(send(), -1.0);
  // All records; the first half; its two halves, of which the second has one record that is too large; the
  // second half.
  EXPECT_THAT(sent(), ElementsAre("\"a\",\"b\",\"c\",\"d\",\"e\"", "\"a\",\"b\"", "\"a\"", "\"b\"",
                                  "\"c\",\"d\",\"e\""));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("a record is too large for it"),
                                    HasSubstr("records dropped meanwhile: 1")));
  EXPECT_EQ(outbox_.count(), 0U);
  add(std::string((std::size_t{8} << 20) - 100, 'x'));
  EXPECT_EQ(outbox_.takeDropped(), 0U);  // all room is free again
}

TEST_F(OtlpSenderTest, HalvesThatCannotBeSentNowAreKept) {
  client_.answers = {answerOf(413), answerOf(503)};
  add("a");
  add("b");
  EXPECT_EQ(send(), 5.0);
  EXPECT_EQ(outbox_.count(), 2U);
  clock_.advance(5.0);
  EXPECT_EQ(send(), -1.0);
  EXPECT_THAT(sent(), ElementsAre("\"a\",\"b\"", "\"a\"", "\"a\"", "\"b\""));
}

TEST_F(OtlpSenderTest, LogsAPartialSuccessAndDoesNotTryAgain) {
  client_.answers = {
      answerOf(200, R"({"partialSuccess":{"rejectedLogRecords":"2","errorMessage":"old\nnews"}})"),
      answerOf(200, R"({"partialSuccess":{"errorMessage":"slow down"}})")};
  for (const char* record : {"a", "b", "c"}) add(record);
  EXPECT_EQ(send(), -1.0);
  add("d");
  EXPECT_EQ(send(), -1.0);
  EXPECT_THAT(client_.requests, SizeIs(2));
  EXPECT_THAT(errors(), ElementsAre("http://fleet/v1/logs rejected records: 2 (old?news)"));
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kDefault), ElementsAre(HasSubstr("says: slow down")));
  sender_.logLosses();
  EXPECT_THAT(errors().back(), HasSubstr("dropped in all: 2"));
}

TEST_F(OtlpSenderTest, AnInvalidAnswerIsLoggedOnceAndTheRecordsAreDelivered) {
  HttpAnswer cut = answerOf(200, "xxx");
  cut.problem = "too long";
  client_.answers = {answerOf(200, "<html>"), answerOf(200, "<html>"), cut, answerOf(200, "{}")};
  for (const char* record : {"a", "b", "c", "d"}) {
    add(record);
    EXPECT_EQ(send(), -1.0);
  }
  EXPECT_EQ(outbox_.count(), 0U);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("its answer cannot be read"),
                                    HasSubstr("its answer is not whole: too long")));
}

TEST_F(OtlpSenderTest, LogsHowManyRecordsWereDroppedAfterTheNextDelivery) {
  client_.answers = {noAnswer("refused")};
  add("a");
  send();
  for (int n = 0; n < 3; ++n) add(std::string(std::size_t{8} << 20, 'x'));
  clock_.advance(5.0);
  EXPECT_EQ(send(), -1.0);
  EXPECT_THAT(errors().back(), HasSubstr("goes on; records dropped meanwhile: 3"));
  sender_.logLosses();
  EXPECT_THAT(errors().back(), HasSubstr("dropped in all: 3"));
}

TEST_F(OtlpSenderTest, AtTheEndLogsLostRecords) {
  client_.answers = {noAnswer("refused")};
  add("a");
  send();
  add("b");
  sender_.logLosses();
  EXPECT_THAT(errors().back(), HasSubstr("records lost that could not be sent to http://fleet/v1/logs: 2"));
}

TEST_F(OtlpSenderTest, WithoutRetryDelayTriesOnceMoreUnlessTheEndpointAskedToWait) {
  client_.answers = {noAnswer("refused"), answerOf(429, "", "60")};
  add("a");
  send();
  sender_.skipRetryDelay();
  EXPECT_EQ(send(), 60.0);
  EXPECT_THAT(client_.requests, SizeIs(2));
  sender_.skipRetryDelay();
  EXPECT_EQ(send(), 60.0);
  EXPECT_THAT(client_.requests, SizeIs(2));
}

}  // namespace
}  // namespace tonewerk
