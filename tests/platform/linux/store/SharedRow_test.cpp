// SPDX-License-Identifier: Apache-2.0
//
// A message that is an analytics event and a real-time-communication message is one row of the store, and
// looks to every reader like a row of each.

#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/otlp/HttpClient.h"
#include "platform/linux/otlp/LinuxLinkReport.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/RowsOf.h"
#include "platform/linux/store/StoreMetricon.h"
#include "platform/linux/store/StoreQueries.h"
#include "platform/linux/store/StoreReader.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "values/CompactJson.h"

namespace tonewerk {
namespace {

using testing::Contains;
using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

constexpr std::chrono::seconds kLongEnough{30};
const EventNames kNames("com.orvane.first", "com.orvane.second");

class SharedRowTest : public testing::Test {
 protected:
  SharedRowTest() {
    session_->sessionInfo = {{"s", 1}};
    session_->userInfo = {{kLinkReportUserInfoServiceName, "telephony_session"}};
    open();
  }
  void open() {
    ReportStore::Limits limits;
    // No batch ends between an event and its message, however large they are.
    limits.gather = kLongEnough;
    limits.bytes = 256 << 20;
    store_ = std::make_unique<ReportStore>(directory_.path(), json_, preferences_, clock_, accounts_,
                                           category_, limits);
  }
  void recordEvent(const ValueMap& payload, const EventNames& names = kNames) {
    store_->recordEvent(clock_.now(), names, payload);
  }
  void recordMessage(const ValueMap& payload, std::string_view hidden = "hidden") {
    store_->record(RtcMessageRow{clock_.now(), session_, 4, 3, payload, hidden});
  }
  void recordBoth(const ValueMap& payload) {
    recordEvent(payload);
    recordMessage(payload);
  }

  // The columns of each row, joined by spaces.
  std::vector<std::string> rows(const std::string& sql, int columns = 1) {
    EXPECT_TRUE(store_ == nullptr || store_->flush(kLongEnough));
    SqliteDatabase database;
    EXPECT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly, kLongEnough));
    return rowsOf(database, sql, columns);
  }
  std::vector<std::string> eventPayloads() { return rows("SELECT payload FROM analytics_event ORDER BY id"); }
  std::vector<std::string> messagePayloads() { return rows("SELECT payload FROM rtc_message ORDER BY id"); }
  std::string number(const std::string& sql) { return rows(sql).at(0); }

  TemporaryDirectory directory_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  ManualClock clock_;
  const std::shared_ptr<RtcSessionRecord> session_ = std::make_shared<RtcSessionRecord>();
  Accounts accounts_{990, clock_};
  std::unique_ptr<ReportStore> store_;
};

TEST_F(SharedRowTest, BothViewsShowTheRow) {
  recordBoth({{"a", 1}, {"hidden", 1763633880.25}});
  EXPECT_THAT(rows("SELECT id, recorded_at, name, payload FROM analytics_event ORDER BY id", 4),
              ElementsAre(R"(2 1763633880.0 com.orvane.first {"a":1,"hidden":1763633880.25})",
                          R"(3 1763633880.0 com.orvane.second {"a":1,"hidden":1763633880.25})"));
  EXPECT_THAT(
      rows("SELECT id, sent_at, rtc_session, category, type, payload, typeof(payload) FROM rtc_message", 7),
      ElementsAre(R"(1 1763633880.0 1 4 3 {"a":1} text)"));
  EXPECT_EQ(number("SELECT count(*) FROM analytics_row"), "1");
  EXPECT_EQ(number("SELECT count(*) FROM rtc_row"), "0");
  EXPECT_EQ(number("SELECT count(*) FROM rtc_session"), "1");
}

TEST_F(SharedRowTest, AnEventAndAMessageOfTwoUsersHaveRowsOfTheirOwn) {
  const ValueMap payload{{"a", 1}};
  const std::shared_ptr<Account> first = accounts_.of(1001);
  const std::shared_ptr<Account> second = accounts_.of(1002);
  {
    const WorkingFor scope(first);
    recordBoth(payload);
    recordEvent(payload);
  }
  {
    const WorkingFor scope(second);
    recordMessage(payload);
  }
  EXPECT_THAT(rows("SELECT user_id, rtc_session FROM analytics_row ORDER BY id", 2),
              ElementsAre("1001 1", "1001 "));
  EXPECT_THAT(rows("SELECT user_id FROM rtc_row"), ElementsAre("1002"));
}

TEST_F(SharedRowTest, TheMessageHasNoHiddenEntryWhereverItIs) {
  const std::vector<ValueMap> payloads{
      {{"hidden", 1.5}, {"a", 1}},
      {{"a", 1}, {"hidden", 1.5}, {"b", 2}},
      {{"a", 1}, {"hidden", 1.5}},
      {{"hidden", 1.5}},
      {{"a", 1}},
      {{"\u00e4\u20ac", "\U0001F600 \u00fc"}, {"hidden", 1.5}, {"b", "\u00f6"}},
      {{"invalid", "a\xC3"}, {"hidden", 1.5}, {"b", "\xFF"}},
  };
  std::vector<std::string> whole;
  std::vector<std::string> cut;
  for (const ValueMap& payload : payloads) {
    recordBoth(payload);
    appendCompactJson(whole.emplace_back(), payload);
    appendCompactJson(cut.emplace_back(), payload, "hidden");
  }
  // Compared in hexadecimal digits, because reading makes texts valid.
  const auto hex = [](const std::vector<std::string>& texts) {
    std::vector<std::string> digits;
    for (const std::string& text : texts) {
      std::string& made = digits.emplace_back();
      for (const char c : text) {
        made += "0123456789ABCDEF"[static_cast<unsigned char>(c) >> 4];
        made += "0123456789ABCDEF"[static_cast<unsigned char>(c) & 15];
      }
    }
    return digits;
  };
  EXPECT_EQ(rows("SELECT hex(payload) FROM analytics_event WHERE name = 'com.orvane.first' ORDER BY id"),
            hex(whole));
  EXPECT_EQ(rows("SELECT hex(payload) FROM rtc_message ORDER BY id"), hex(cut));
  EXPECT_EQ(number("SELECT count(*) FROM rtc_row"), "0");
}

TEST_F(SharedRowTest, TheMessageIsWholeWithoutAHiddenKey) {
  const ValueMap payload{{"a", 1}, {"hidden", 1.5}};
  recordEvent(payload);
  recordMessage(payload, {});
  EXPECT_THAT(messagePayloads(), ElementsAre(R"({"a":1,"hidden":1.5})"));
  EXPECT_EQ(number("SELECT count(*) FROM rtc_row"), "0");
}

TEST_F(SharedRowTest, AHiddenEntryThatIsNoNumberIsLeftOutOfARowOfItsOwn) {
  recordBoth({{"a", 1}, {"hidden", "text"}});
  EXPECT_THAT(messagePayloads(), ElementsAre(R"({"a":1})"));
  EXPECT_EQ(number("SELECT count(*) FROM rtc_row"), "1");
}

TEST_F(SharedRowTest, AllCategoriesAndTypesHaveRoomInARow) {
  for (const auto& [category, type] : {std::pair{0, 0}, {65535, 65535}, {0, 65535}, {65535, 0}, {4, 3}}) {
    const ValueMap payload{{"a", 1}, {"hidden", 2}};
    recordEvent(payload);
    store_->record(RtcMessageRow{clock_.now(), session_, static_cast<std::uint16_t>(category),
                                 static_cast<std::uint16_t>(type), payload, "hidden"});
  }
  EXPECT_THAT(rows("SELECT category, type, payload FROM rtc_message ORDER BY id", 3),
              ElementsAre(R"(0 0 {"a":1})", R"(65535 65535 {"a":1})", R"(0 65535 {"a":1})",
                          R"(65535 0 {"a":1})", R"(4 3 {"a":1})"));
  EXPECT_EQ(number("SELECT count(*) FROM rtc_row"), "0");
}

TEST_F(SharedRowTest, AMessageWithALongTextOrALongHiddenEntryHasARowOfItsOwn) {
  const std::string key(kMaxHiddenBytes, 'k');
  const ValueMap longKey{{"a", 1}, {key, 2}};
  recordEvent(longKey);
  recordMessage(longKey, key);
  // The text is `{"t":"...","hidden":2}`, and the message lacks 11 bytes of it.
  for (const std::size_t size : {StoreBatch::kMaxSharedTextBytes, StoreBatch::kMaxSharedTextBytes + 1}) {
    recordBoth({{"t", std::string(size - 19, 'x')}, {"hidden", 2}});
  }
  const std::size_t longest = StoreBatch::kMaxSharedTextBytes - 11;
  EXPECT_THAT(rows("SELECT length(payload) FROM rtc_message ORDER BY id"),
              ElementsAre("7", std::to_string(longest), std::to_string(longest + 1)));
  EXPECT_THAT(rows("SELECT length(payload) FROM rtc_row ORDER BY id"),
              ElementsAre("7", std::to_string(longest + 1)));
}

TEST_F(SharedRowTest, AnEventAloneIsNoMessageAndAMessageAloneIsNoEvent) {
  recordEvent({{"n", 1}});
  recordMessage({{"n", 2}, {"hidden", 3}});
  EXPECT_THAT(eventPayloads(), ElementsAre(R"({"n":1})", R"({"n":1})"));
  EXPECT_THAT(messagePayloads(), ElementsAre(R"({"n":2})"));
}

TEST_F(SharedRowTest, AMessageThatComesAfterItsEventWasWrittenIsThereOnce) {
  const ValueMap payload{{"n", 1}, {"hidden", 3}};
  recordEvent(payload);
  ASSERT_TRUE(store_->flush(kLongEnough));
  recordMessage(payload);
  EXPECT_THAT(eventPayloads(), SizeIs(2));
  EXPECT_THAT(messagePayloads(), ElementsAre(R"({"n":1})"));
}

// Events alone, messages alone and both in turns, in one batch and in several, also after a restart.
TEST_F(SharedRowTest, IdentifiersGrowInBothViewsInTheOrderOfRecording) {
  std::vector<std::string> events;
  std::vector<std::string> messages;
  for (int n = 0; n < 400; ++n) {
    const ValueMap payload{{"n", n}};
    const int kind = (n * 7 + n / 5) % 4;  // the fourth kind is an event and a message apart
    if (kind != 0) {
      recordEvent(payload, "com.orvane.first");
      events.push_back(payload.text());
    }
    if (kind == 3) recordMessage({{"between", n}});
    if (kind == 3) messages.push_back(ValueMap{{"between", n}}.text());
    if (kind != 1) {
      recordMessage(payload);
      messages.push_back(payload.text());
    }
    if (n % 90 == 50) ASSERT_TRUE(store_->flush(kLongEnough));
    if (n % 150 == 149) {
      store_.reset();
      open();
    }
  }
  EXPECT_EQ(eventPayloads(), events);
  EXPECT_EQ(messagePayloads(), messages);
  EXPECT_EQ(number("SELECT count(DISTINCT id) FROM rtc_message"), std::to_string(messages.size()));
  EXPECT_NE(number("SELECT count(*) FROM rtc_row"), "0");
  EXPECT_NE(number("SELECT count(*) FROM analytics_row WHERE rtc_session IS NOT NULL"), "0");
}

TEST_F(SharedRowTest, RowsOfAnotherProgramDoNotStopRecording) {
  recordBoth({{"n", 1}});
  ASSERT_TRUE(store_->flush(kLongEnough));
  SqliteDatabase other;
  ASSERT_TRUE(other.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(
      other.run("INSERT INTO analytics_row (id, recorded_at, name_set, payload)"
                " VALUES (2, 0.5, 1, '{\"n\":2}'), (7, 0.5, 1, '{\"n\":7}')"));
  recordBoth({{"n", 8}});
  recordMessage({{"n", 9}});
  EXPECT_THAT(rows("SELECT id, payload FROM analytics_row ORDER BY id", 2),
              ElementsAre(R"(1 {"n":1})", R"(2 {"n":2})", R"(7 {"n":7})", R"(8 {"n":8})"));
  EXPECT_THAT(rows("SELECT id, payload FROM rtc_message ORDER BY id", 2),
              ElementsAre(R"(1 {"n":1})", R"(8 {"n":8})", R"(9 {"n":9})"));
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kError), IsEmpty());
}

// A program that follows the messages would miss one with a lower identifier.
TEST_F(SharedRowTest, AFollowerOfTheMessagesMissesNone) {
  std::int64_t last = 0;
  std::vector<std::string> followed;
  StoreReader reader;
  for (int n = 0; n < 40; ++n) {
    const ValueMap payload{{"n", n}};
    if (n % 3 != 0) recordEvent(payload);
    if (n % 7 == 0) recordEvent({{"alone", n}});
    recordMessage(payload);
    ASSERT_TRUE(store_->flush(kLongEnough));
    if (n % 10 == 9) {
      store_.reset();
      open();
      ASSERT_TRUE(store_->flush(kLongEnough));
    }
    ASSERT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone);
    EventFilter filter;
    filter.afterId = last;
    filter.name = "telephony*";
    ASSERT_TRUE(reader.readRtcMessages(filter, [&](const StoredRtcMessage& message) {
      followed.push_back(message.payload);
      last = message.id;
    })) << reader.problem();
    ASSERT_THAT(followed, SizeIs(n + 1));
    EXPECT_EQ(followed.back(), payload.text());
  }
}

TEST_F(SharedRowTest, TheMessagesAfterAnIdentifierAreFoundByKeyAndNotSorted) {
  for (int n = 0; n < 10; ++n) recordBoth({{"n", n}});
  EventFilter named;
  named.name = "telephony*";
  named.since = 1.0;
  for (const std::string& query :
       {std::string("SELECT id, sent_at, rtc_session, category, type, payload FROM rtc_message"
                    " WHERE id > 5 ORDER BY id"),
        rtcMessageQuery({}), rtcMessageQuery(named)}) {
    const auto plan = rows("EXPLAIN QUERY PLAN " + query, 4);
    EXPECT_THAT(plan, Each(Not(HasSubstr("TEMP B-TREE")))) << query;
    EXPECT_THAT(plan, Contains(HasSubstr("SEARCH rtc_row USING INTEGER PRIMARY KEY (rowid>?)")));
    EXPECT_THAT(plan, Contains(HasSubstr("SEARCH analytics_row USING INTEGER PRIMARY KEY (rowid>?)")));
  }
}

// With a limit, only the rows that are returned are turned round.
TEST_F(SharedRowTest, TheNewestMessagesAreFoundByKey) {
  recordBoth({{"n", 1}});
  EventFilter filter;
  filter.name = "telephony*";
  filter.limit = 3;
  const auto plan = rows("EXPLAIN QUERY PLAN " + rtcMessageQuery(filter), 4);
  EXPECT_THAT(plan, Contains(HasSubstr("MERGE (UNION ALL)")));
  EXPECT_THAT(plan, Contains(HasSubstr("TEMP B-TREE")).Times(1));
}

// docs/store.md says which queries sort and which read everything.
TEST_F(SharedRowTest, AQueryInTheOrderOfTheIdentifierSortsNothingWhenItSelectsIt) {
  recordBoth({{"n", 1}});
  const auto sorts = [this](const std::string& query) {
    const auto plan = rows("EXPLAIN QUERY PLAN " + query, 4);
    return testing::Matches(Contains(HasSubstr("TEMP B-TREE")))(plan);
  };
  const std::string join =
      " FROM rtc_session AS s JOIN rtc_message AS m ON m.rtc_session = s.id"
      " WHERE s.user_info ->> 'kLinkReportUserInfoServiceName' = 'telephony_session' ORDER BY m.id";
  EXPECT_FALSE(sorts("SELECT m.id, s.session_info ->> 'x' AS reporter, m.payload" + join));
  EXPECT_TRUE(sorts("SELECT s.session_info ->> 'x' AS reporter, m.payload" + join));
  EXPECT_FALSE(sorts("SELECT id FROM rtc_message ORDER BY id DESC LIMIT 1"));
}

TEST_F(SharedRowTest, TheNewestRowsByTheLimitOfTheReaderAreThoseOfBothKinds) {
  for (int n = 0; n < 6; ++n) {
    const ValueMap payload{{"n", n}};
    if (n % 2 == 0) recordEvent(payload);
    recordMessage(payload);
  }
  ASSERT_TRUE(store_->flush(kLongEnough));
  StoreReader reader;
  ASSERT_EQ(reader.open(directory_.path()), StoreReader::Outcome::kDone);
  EventFilter filter;
  filter.limit = 3;
  std::vector<std::string> found;
  ASSERT_TRUE(reader.readRtcMessages(
      filter, [&](const StoredRtcMessage& message) { found.push_back(message.payload); }));
  EXPECT_THAT(found, ElementsAre(R"({"n":3})", R"({"n":4})", R"({"n":5})"));
}

TEST_F(SharedRowTest, RowsOfAllKindsAreDeletedWhenTheyAreOldAndTheirIdentifiersAreNotUsedAgain) {
  for (int n = 0; n < 50; ++n) {
    recordBoth({{"n", n}});
    recordMessage({{"alone", n}});
  }
  const std::int64_t last = std::stoll(number("SELECT max(id) FROM rtc_message"));
  clock_.advance(31 * 86'400.0);
  recordBoth({{"n", 50}});
  EXPECT_THAT(eventPayloads(), ElementsAre(R"({"n":50})", R"({"n":50})"));
  EXPECT_THAT(messagePayloads(), ElementsAre(R"({"n":50})"));
  store_.reset();
  open();
  recordMessage({{"alone", 51}});
  EXPECT_THAT(messagePayloads(), ElementsAre(R"({"n":50})", R"({"alone":51})"));
  EXPECT_GT(std::stoll(number("SELECT min(id) FROM rtc_message")), last);
}

TEST_F(SharedRowTest, TheNewestMessageOfAllStaysAlsoWhenItHasARowOfItsOwn) {
  recordBoth({{"n", 1}});
  for (int n = 2; n < 5; ++n) recordMessage({{"alone", n}});
  ASSERT_TRUE(store_->flush(kLongEnough));
  clock_.advance(31 * 86'400.0);
  store_->record(PowerRow{clock_.now(), 28, "power", {}});  // rows are deleted when something is written
  EXPECT_THAT(rows("SELECT id, payload FROM rtc_message ORDER BY id", 2),
              ElementsAre(R"(1 {"n":1})", R"(4 {"alone":4})"));
  store_.reset();
  open();
  recordMessage({{"alone", 5}});
  EXPECT_THAT(rows("SELECT id FROM rtc_message ORDER BY id DESC LIMIT 1"), ElementsAre("5"));
}

// The highest identifier of all stays in the file, although no message does.
TEST_F(SharedRowTest, TheNewestMessageGoesWhenAnEventIsNewer) {
  recordMessage({{"alone", 1}});
  recordBoth({{"n", 2}});
  recordEvent({{"n", 3}});
  EXPECT_THAT(rows("SELECT id FROM rtc_message ORDER BY id"), ElementsAre("1", "2"));
  clock_.advance(31 * 86'400.0);
  store_->record(PowerRow{clock_.now(), 28, "power", {}});  // rows are deleted when something is written
  EXPECT_THAT(messagePayloads(), IsEmpty());
  EXPECT_THAT(rows("SELECT id, payload FROM analytics_row", 2), ElementsAre(R"(3 {"n":3})"));
  EXPECT_THAT(rows("SELECT id FROM rtc_session"), ElementsAre("1"));
  store_.reset();
  open();
  recordMessage({{"alone", 4}});
  EXPECT_THAT(rows("SELECT id, payload FROM rtc_message", 2), ElementsAre(R"(4 {"alone":4})"));
}

TEST_F(SharedRowTest, TheNewestRowIsEmptyInBothViewsWhenTheBoundHasNoRoomForIt) {
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 1);
  store_->readBoundsAgain();
  recordBoth({{"text", std::string(2 << 20, 'x')}, {"hidden", 1.5}, {"b", 2}});
  EXPECT_THAT(eventPayloads(), ElementsAre("{}", "{}"));
  EXPECT_THAT(messagePayloads(), ElementsAre("{}"));
}

// A row that the store shares is too small for this. Another program may have written, although it should
// not.
TEST_F(SharedRowTest, ASharedRowThatIsEmptiedIsEmptyInBothViews) {
  recordBoth({{"hidden", 1.5}, {"text", "short"}});
  store_.reset();
  SqliteDatabase other;
  ASSERT_TRUE(other.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(
      other.run("UPDATE analytics_row SET payload = replace(payload, 'short', hex(zeroblob(1 << 20)))"));
  other.close();
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 1);
  open();
  store_->record(PowerRow{clock_.now(), 28, "power", {}});
  EXPECT_THAT(eventPayloads(), ElementsAre("{}", "{}"));
  EXPECT_THAT(messagePayloads(), ElementsAre("{}"));
}

// As the analytics worker and the real-time-communication worker pass a message on, without any preference.
TEST_F(SharedRowTest, TheServicesShareTheRowsOfMessagesThatBothTake) {
  StoreMetricon metricon(*store_, preferences_, clock_, category_);
  LinuxLinkReport linkReport(*store_, preferences_, clock_, category_, "1", [] { return nullptr; });
  const auto session =
      linkReport.initWithSessionInfo({}, {{kLinkReportUserInfoServiceName, "telephony_session"}}, nullptr);
  session->startConfigurationWithCompletionHandler([](const LinkReportSession::Backends&) {});
  for (int n = 0; n < 5; ++n) {
    ValueMap message{{"hidden", 7.5}, {"n", n}};
    metricon.sendEvent(n == 4 ? EventNames("nobody.asks") : kNames, {}, [&message] { return message; });
    std::string problem;
    ASSERT_TRUE(session->sendMessageWithCategory(4, 1, {message, "hidden"}, problem));
  }
  EXPECT_THAT(eventPayloads(), SizeIs(8));
  EXPECT_THAT(messagePayloads(),
              ElementsAre(R"({"n":0})", R"({"n":1})", R"({"n":2})", R"({"n":3})", R"({"n":4})"));
  EXPECT_THAT(rows("SELECT payload FROM rtc_row"), ElementsAre(R"({"n":4})"));
}

}  // namespace
}  // namespace tonewerk
