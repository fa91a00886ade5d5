// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpExporter.h"

#include <gmock/gmock.h>

#include "platform/Log.h"
#include "platform/linux/otlp/CurlHttpClient.h"
#include "platform/linux/threads/SystemClock.h"
#include "support/OtlpReceiver.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using std::chrono::hours;
using std::chrono::seconds;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using Fault = OtlpReceiver::Fault;
using Urgency = OtlpOutbox::Urgency;

class OtlpExporterTest : public testing::Test {
 protected:
  void open(const std::string& address, const OtlpOutbox::Limits& limits = {}) {
    exporter_.emplace(
        address + "/v1/logs",
        std::make_unique<CurlHttpClient>("tester/1", CurlHttpClient::Timeouts{hours(1), hours(1)}),
        [] {
          return OtlpResource{"n", "v", "h", ""};
        },
        [](const SendingRow&) {}, clock_, category_, RetryPolicy([] { return 0.0; }), limits);
  }
  bool add(int number, Urgency urgency) {
    OtlpLogRecord record;
    record.time = clock_.now();
    record.eventName = "test_session";
    record.identifier = std::to_string(number);
    record.payload = {{"n", number}, {"nested", ValueMap{{"list", ValueArray{1, 2.5, "x"}}}}};
    return exporter_->add(record, urgency);
  }
  bool end() {
    exporter_->beginEnd();
    return exporter_->waitForEnd(std::chrono::steady_clock::now() + seconds(20));
  }
  std::vector<std::string> errors() const { return log_.textsOf("twrs", LogLevel::kError); }

  SystemClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  OtlpReceiver receiver_;
  std::optional<OtlpExporter> exporter_;
};

TEST_F(OtlpExporterTest, SendsRealTimeRecordsWithoutBeingAsked) {
  open(receiver_.address());
  add(1, Urgency::kAtOnce);
  EXPECT_TRUE(receiver_.waitForRequests(1));
  EXPECT_THAT(receiver_.problems(), IsEmpty());
}

TEST_F(OtlpExporterTest, SendsABatchWhenFlushed) {
  OtlpOutbox::Limits patient;
  patient.batchTime = hours(1);
  open(receiver_.address(), patient);
  for (int n = 0; n < 3; ++n) add(n, Urgency::kBatched);
  exporter_->flush();
  ASSERT_TRUE(receiver_.waitForRequests(1));
  EXPECT_THAT(receiver_.records(), SizeIs(3));
  EXPECT_THAT(receiver_.problems(), IsEmpty());
  EXPECT_EQ(receiver_.requests()[0].headers.at("content-encoding"), "gzip");
}

TEST_F(OtlpExporterTest, SendsABatchWhenItsTimeHasCome) {
  OtlpOutbox::Limits hasty;
  hasty.batchTime = std::chrono::milliseconds(1);
  open(receiver_.address(), hasty);
  add(1, Urgency::kBatched);
  EXPECT_TRUE(receiver_.waitForRequests(1));
}

TEST_F(OtlpExporterTest, AtTheEndSendsWaitingRecords) {
  OtlpOutbox::Limits patient;
  patient.batchTime = hours(1);
  open(receiver_.address(), patient);
  for (int n = 0; n < 1000; ++n) add(n, Urgency::kBatched);
  EXPECT_TRUE(end());
  exporter_.reset();
  EXPECT_THAT(receiver_.records(), SizeIs(1000));
  EXPECT_THAT(receiver_.problems(), IsEmpty());
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(OtlpExporterTest, AtTheEndTriesFailedRecordsOnceMore) {
  receiver_.answerNext({.fault = Fault::kCloseEarly});
  open(receiver_.address());
  add(1, Urgency::kAtOnce);
  ASSERT_TRUE(receiver_.waitForRequests(1));
  EXPECT_TRUE(end());
  EXPECT_THAT(receiver_.requests(), SizeIs(2));
}

TEST_F(OtlpExporterTest, AnEndpointThatHangsBlocksNeitherAddNorTheEnd) {
  receiver_.answerNext({.fault = Fault::kHang});
  OtlpOutbox::Limits small;
  small.bytes = 100'000;
  open(receiver_.address(), small);
  add(0, Urgency::kAtOnce);
  ASSERT_TRUE(receiver_.waitForRequests(1));
  int kept = 1;
  for (int n = 1; n < 10'000; ++n) kept += add(n, Urgency::kBatched) ? 1 : 0;
  EXPECT_LT(kept, 1000);
  exporter_->beginEnd();
  EXPECT_FALSE(exporter_->waitForEnd(std::chrono::steady_clock::now()));
  exporter_.reset();
  EXPECT_THAT(errors(), Contains(HasSubstr("could not be sent to " + receiver_.address() +
                                           "/v1/logs: " + std::to_string(kept))));
  EXPECT_THAT(errors(), Contains(HasSubstr("dropped in all: " + std::to_string(10'000 - kept))));
}

TEST_F(OtlpExporterTest, RecordsForADeadEndpointAreLost) {
  open(OtlpReceiver::deadAddress());
  add(1, Urgency::kAtOnce);
  EXPECT_TRUE(end());
  exporter_.reset();
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("records are kept while there is room"),
                                    HasSubstr("records lost that could not be sent")));
}

TEST_F(OtlpExporterTest, HostileAnswersDoNotStopIt) {
  open(receiver_.address());
  int number = 0;
  for (const Fault fault : {Fault::kHugeBody, Fault::kCutBody, Fault::kNone}) {
    receiver_.answerNext({.body = "<html>", .fault = fault});
    add(++number, Urgency::kAtOnce);
    ASSERT_TRUE(receiver_.waitForRequests(static_cast<std::size_t>(number)));
  }
  receiver_.answerNext({.status = 308, .headers = {"Location: http://127.0.0.1:1/"}});
  add(++number, Urgency::kAtOnce);
  add(++number, Urgency::kAtOnce);
  EXPECT_TRUE(end());
  EXPECT_THAT(receiver_.records(), SizeIs(5));
  EXPECT_THAT(receiver_.problems(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
