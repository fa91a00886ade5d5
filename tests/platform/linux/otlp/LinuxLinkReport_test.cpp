// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/LinuxLinkReport.h"

#include <gmock/gmock.h>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/otlp/CurlHttpClient.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/RowsOf.h"
#include "support/OtlpReceiver.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using std::chrono::hours;
using std::chrono::seconds;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

class LinuxLinkReportTest : public testing::Test {
 protected:
  void configure(std::string_view key, const Value& value) {
    preferences_.configure("com.orvane.linkreport", std::string(key), value);
  }
  std::unique_ptr<LinkReportSession> start(bool isBatched = true) {
    auto session = service_.initWithSessionInfo(
        {{kLinkReportSessionInfoSessionID, 77}, {kLinkReportSessionInfoBatchEvent, isBatched}},
        {{kLinkReportUserInfoServiceName, "telephony_session"}}, nullptr);
    session->startConfigurationWithCompletionHandler([this](LinkReportSession::Backends backends) {
      ++answerCount_;
      backends_ = std::move(backends);
    });
    return session;
  }
  bool send(LinkReportSession& session, const ValueMap& payload) {
    return session.sendMessageWithCategory(4, 2, {payload}, problem_);
  }
  // Opens the store after all recorded rows have been written.
  void openStore(SqliteDatabase& database) {
    store_.recordEvent(0.0, "com.orvane.last", {{"n", 1}});
    ASSERT_TRUE(store_.flush(seconds(30)));
    ASSERT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly, seconds(30)));
  }
  std::optional<std::int64_t> count(const std::string& table) {
    SqliteDatabase database;
    openStore(database);
    return database.number("SELECT count(*) FROM " + table);
  }
  std::string text(const std::string& column, const std::string& table) {
    SqliteDatabase database;
    openStore(database);
    SqliteStatement select = database.prepare("SELECT " + column + " FROM " + table);
    return select.step() == SqliteStatement::Step::kRow ? select.text(0) : "(none)";
  }
  std::vector<std::string> errors() const { return log_.textsOf("twrs", LogLevel::kError); }

  TemporaryDirectory directory_;
  ManualClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  Accounts accounts_{990, clock_};
  ReportStore store_{directory_.path(), json_, preferences_, clock_, accounts_, category_};
  OtlpReceiver receiver_;
  LinuxLinkReport service_{
      store_, preferences_, clock_, category_, "1.2.3", [] {
        return std::make_unique<CurlHttpClient>("tester/1", CurlHttpClient::Timeouts{hours(1), hours(1)});
      }};
  int answerCount_ = 0;
  LinkReportSession::Backends backends_;
  std::string problem_;
};

TEST_F(LinuxLinkReportTest, TokensDifferAndBeginWithTheirParents) {
  const auto root = service_.newHierarchyTokenFromParentToken(std::nullopt);
  const auto other = service_.newHierarchyTokenFromParentToken(std::nullopt);
  ASSERT_TRUE(root && other);
  EXPECT_NE(*root, *other);
  EXPECT_THAT(*service_.newHierarchyTokenFromParentToken(root), HasSubstr(*root + "/"));
}

TEST_F(LinuxLinkReportTest, StoresSessionsAndMessagesWithoutAnyPreference) {
  const auto session = start();
  EXPECT_EQ(answerCount_, 1);
  EXPECT_THAT(backends_.value(), ElementsAre("local"));
  EXPECT_EQ(count("rtc_session"), 1);  // before any message
  EXPECT_TRUE(send(*session, {{"a", 1}}));
  EXPECT_EQ(text("session_info", "rtc_session"),
            R"({"kLinkReportSessionInfoSessionID":77,"kLinkReportSessionInfoBatchEvent":true})");
  EXPECT_EQ(text("user_info", "rtc_session"), R"({"kLinkReportUserInfoServiceName":"telephony_session"})");
  EXPECT_EQ(text("started_at", "rtc_session"), "1763633880.0");
  EXPECT_EQ(text("payload", "rtc_message"), R"({"a":1})");
  EXPECT_EQ(text("rtc_session || ' ' || category || ' ' || type", "rtc_message"), "1 4 2");
}

TEST_F(LinuxLinkReportTest, WithAnEmptyArrayThereAreNoBackendsAndNothingIsStored) {
  configure("backends", ValueArray{});
  const auto session = start();
  EXPECT_EQ(answerCount_, 1);
  EXPECT_EQ(backends_, std::nullopt);
  EXPECT_EQ(count("rtc_session"), 0);
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(LinuxLinkReportTest, SendsToAnEndpointAndStoresNothingWhenOnlyThatIsNamed) {
  configure("backends", ValueArray{receiver_.address()});
  const auto session = start();
  EXPECT_THAT(backends_.value(), ElementsAre(receiver_.address()));
  send(*session, {{"a", 1}, {"nested", ValueMap{{"x", 0.5}}}});
  session->flushMessages();
  ASSERT_TRUE(receiver_.waitForRequests(1));
  EXPECT_THAT(receiver_.problems(), IsEmpty());
  ASSERT_THAT(receiver_.records(), SizeIs(1));
  const json record = receiver_.records()[0];
  EXPECT_EQ(record["eventName"], "telephony_session");
  EXPECT_EQ(record["timeUnixNano"], "1763633880000000000");
  EXPECT_THAT(record["attributes"], Contains(json::parse(R"({"key":"a","value":{"intValue":"1"}})")));
  EXPECT_THAT(record["attributes"],
              Contains(json::parse(R"({"key":"session.id","value":{"stringValue":"77"}})")));
  EXPECT_EQ(count("rtc_session"), 0);
}

TEST_F(LinuxLinkReportTest, SendsAndStores) {
  configure("backends", ValueArray{receiver_.address(), "local"});
  const auto session = start(false);
  send(*session, {{"a", 1}});
  EXPECT_TRUE(receiver_.waitForRequests(1));  // at once: real-time
  EXPECT_EQ(count("rtc_message"), 1);
}

TEST_F(LinuxLinkReportTest, SessionsShareAnEndpointsExporter) {
  configure("backends", ValueArray{receiver_.address()});
  const auto first = start();
  const auto second = start();
  send(*first, {{"a", 1}});
  send(*second, {{"a", 2}});
  EXPECT_TRUE(service_.finish(seconds(20)));
  EXPECT_THAT(receiver_.requests(), SizeIs(1));
  EXPECT_THAT(receiver_.records(), SizeIs(2));
}

TEST_F(LinuxLinkReportTest, TheLedgerInTheStoreHasEachSending) {
  receiver_.answerNext({.status = 400});
  configure("backends", ValueArray{receiver_.address()});
  const auto session = start();
  send(*session, {{"a", 1}});
  send(*session, {{"a", 2}});
  session->flushMessages();
  ASSERT_TRUE(receiver_.waitForRequests(1));
  send(*session, {{"a", 3}});
  EXPECT_TRUE(service_.finish(seconds(20)));
  ASSERT_THAT(receiver_.requests(), SizeIs(2));
  SqliteDatabase database;
  openStore(database);
  EXPECT_THAT(
      rowsOf(database,
             "SELECT id, at, endpoint, signal, records, bytes, coalesce(first_event, last_event, '-'),"
             " status, outcome, problem IS NULL FROM ledger",
             10),
      ElementsAre("1 1763633880.0 " + receiver_.address() + "/v1/logs logs 2 " +
                      receiver_.requests()[0].headers.at("content-length") + " - 400 dropped 1",
                  "2 1763633880.0 " + receiver_.address() + "/v1/logs logs 1 " +
                      receiver_.requests()[1].headers.at("content-length") + " - 200 delivered 1"));
  EXPECT_EQ(count("analytics_row"), 2);  // those of the test, not of what was sent
}

TEST_F(LinuxLinkReportTest, NamesTheDeviceOnlyAfterTheUserOptedIn) {
  configure("backends", ValueArray{receiver_.address()});
  const auto session = start(false);
  send(*session, {{"a", 1}});
  ASSERT_TRUE(receiver_.waitForRequests(1));
  configure("device_id", "speaker-7");
  send(*session, {{"a", 2}});
  ASSERT_TRUE(receiver_.waitForRequests(2));
  EXPECT_THAT(receiver_.requests()[0].body, Not(HasSubstr("device.id")));
  EXPECT_THAT(receiver_.requests()[0].body, HasSubstr("service.version"));
  EXPECT_THAT(receiver_.requests()[1].body,
              HasSubstr(R"({"key":"device.id","value":{"stringValue":"speaker-7"}})"));
}

TEST_F(LinuxLinkReportTest, RepeatsTheEventsNameWhereAskedTo) {
  configure("backends", ValueArray{receiver_.address()});
  configure("event_name_attribute", true);
  const auto session = start(false);
  send(*session, {{"a", 1}});
  ASSERT_TRUE(receiver_.waitForRequests(1));
  EXPECT_THAT(receiver_.requests()[0].body, HasSubstr("event.name"));
  EXPECT_THAT(receiver_.problems(), IsEmpty());
}

TEST_F(LinuxLinkReportTest, LogsAnInvalidPreferenceOnceAndUsesAChangeInTheNextSession) {
  configure("backends", ValueArray{"nonsense"});
  start();
  start();
  EXPECT_EQ(backends_, std::nullopt);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("\"nonsense\" is neither \"local\" nor an address")));
  configure("backends", ValueArray{"local"});
  start();
  EXPECT_TRUE(backends_.has_value());
}

TEST_F(LinuxLinkReportTest, RefusesAPayloadThatIsTooLarge) {
  const auto session = start();
  EXPECT_FALSE(send(*session, {{"a", std::string(LinuxLinkReport::kMaxPayloadBytes, 'x')}}));
  EXPECT_THAT(problem_, HasSubstr("too large"));
  EXPECT_EQ(count("rtc_message"), 0);
}

TEST_F(LinuxLinkReportTest, AHiddenEntryCountsNotAgainstTheLimit) {
  const auto session = start();
  const ValueMap payload{{"a", 1}, {"times", std::string(LinuxLinkReport::kMaxPayloadBytes, 'x')}};
  EXPECT_TRUE(session->sendMessageWithCategory(4, 2, {payload, "times"}, problem_)) << problem_;
  EXPECT_FALSE(session->sendMessageWithCategory(4, 2, {payload, "a"}, problem_));
}

TEST_F(LinuxLinkReportTest, SendsAHiddenEntryToNobody) {
  configure("backends", ValueArray{"local", receiver_.address()});
  const auto session = start(false);
  const ValueMap payload{{"shown", 1}, {"hidden", 2}};
  ASSERT_TRUE(session->sendMessageWithCategory(4, 2, {payload, "hidden"}, problem_));
  ASSERT_TRUE(receiver_.waitForRequests(1));
  const std::string body = receiver_.requests().front().body;
  EXPECT_THAT(body, HasSubstr("shown"));
  EXPECT_THAT(body, Not(HasSubstr("hidden")));
  EXPECT_EQ(text("payload", "rtc_message"), R"({"shown":1})");
}

TEST_F(LinuxLinkReportTest, IsQuickWithoutAnEndpoint) {
  EXPECT_TRUE(start()->isQuick());
  configure("backends", ValueArray{"local", receiver_.address()});
  EXPECT_FALSE(start()->isQuick());
}

TEST_F(LinuxLinkReportTest, SaysHowEachEndpointStands) {
  EXPECT_THAT(service_.endpoints(), IsEmpty());
  receiver_.answerNext({.fault = OtlpReceiver::Fault::kHang});
  configure("backends", ValueArray{receiver_.address()});
  const auto session = start(false);
  send(*session, {{"a", 1}});
  ASSERT_TRUE(receiver_.waitForRequests(1));
  const std::vector<EndpointStatus> endpoints = service_.endpoints();
  ASSERT_THAT(endpoints, SizeIs(1));
  EXPECT_EQ(endpoints[0].url, receiver_.address() + "/v1/logs");
  EXPECT_EQ(endpoints[0].waiting, 1U) << "it is not answered yet";
  EXPECT_EQ(endpoints[0].dropped, 0U);
  EXPECT_EQ(endpoints[0].problem, "");
}

TEST_F(LinuxLinkReportTest, LimitsTheNumberOfAddresses) {
  for (int n = 0; n < 20; ++n) {
    configure("backends", ValueArray{receiver_.address() + "/" + std::to_string(n)});
    start();
  }
  EXPECT_THAT(errors(), Contains(HasSubstr("no more than 16 addresses")));
}

TEST_F(LinuxLinkReportTest, TheEndDoesNotWaitForAnEndpointThatHangs) {
  receiver_.answerNext({.fault = OtlpReceiver::Fault::kHang});
  configure("backends", ValueArray{receiver_.address()});
  const auto session = start(false);
  send(*session, {{"a", 1}});
  ASSERT_TRUE(receiver_.waitForRequests(1));
  EXPECT_FALSE(service_.finish(std::chrono::milliseconds(1)));
}

}  // namespace
}  // namespace tonewerk
