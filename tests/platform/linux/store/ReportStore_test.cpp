// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/ReportStore.h"

#include <atomic>
#include <chrono>
#include <cmath>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gmock/gmock.h>
#include <iterator>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <system_error>
#include <thread>
#include <tuple>
#include <vector>

#include "platform/Clock.h"
#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/store/FullDisk.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreSchema.h"
#include "platform/linux/store/StoreTrimmer.h"
#include "support/InterceptedCalls.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using std::chrono::seconds;
using testing::AllOf;
using testing::Each;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr seconds kLongEnough{30};
constexpr double kDay = 86'400.0;
constexpr std::uint32_t kOwner = 990;

struct Event {
  std::int64_t id;
  double recordedAt;
  std::string name;
  std::string payload;
};

class ReportStoreTest : public testing::Test {
 protected:
  void open(const ReportStore::Limits& limits = {}) {
    store_.reset();
    store_ = std::make_unique<ReportStore>(directory_, json_, preferences_, clock_, accounts_, category_,
                                           limits, beforeWriting_);
  }
  void close() { store_.reset(); }

  void record(EventNames names, ValueMap payload) {
    store_->recordEvent(clock_.now(), std::move(names), std::move(payload));
  }
  // Records `count` events, numbered from `first`. Each has a payload of its own.
  void recordNumbered(int count, int first = 0) {
    for (int n = first; n < first + count; ++n) record("com.orvane.n", {{"n", n}});
  }
  void recordPower(int n, const std::string& text = "") {
    store_->record(PowerRow{clock_.now(), 28, "power", {{"n", n}, {"text", text}}});
  }
  bool flush() { return store_->flush(kLongEnough); }

  std::string file() const { return file_; }
  static std::string contentsOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
  }

  std::vector<Event> events(const std::string& where = "1") {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(file(), SqliteDatabase::Mode::kReadOnly, kLongEnough)) << database.problem();
    SqliteStatement select = database.prepare(
        "SELECT id, recorded_at, name, payload FROM analytics_event WHERE " + where + " ORDER BY id");
    std::vector<Event> found;
    while (select.step() == SqliteStatement::Step::kRow) {
      found.push_back({select.integer(0), select.number(1), select.text(2), select.text(3)});
    }
    return found;
  }
  std::vector<std::string> payloads() {
    std::vector<std::string> found;
    for (const Event& event : events()) found.push_back(event.payload);
    return found;
  }
  std::int64_t number(const std::string& sql) {
    SqliteDatabase database;
    EXPECT_TRUE(database.open(file(), SqliteDatabase::Mode::kReadOnly, kLongEnough)) << database.problem();
    const auto found = database.number(sql);
    EXPECT_TRUE(found) << sql << ": " << database.problem();
    return found.value_or(-1);
  }
  std::vector<std::string> errors() { return log_.textsOf("twrs", LogLevel::kError); }

  TemporaryDirectory temporary_;
  std::string directory_ = temporary_.path("state");
  std::string file_ = directory_ + "/reports.db";
  ManualClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  Accounts accounts_{kOwner, clock_};
  std::function<void()> beforeWriting_;
  std::vector<FileDescriptor> openFiles_;  // closed after the store
  std::unique_ptr<ReportStore> store_;
};

TEST_F(ReportStoreTest, KeepsAnEventWithItsTimeNameAndPayload) {
  open();
  record("com.orvane.telephony.Playback.Stop", {{"volume", 0.5}, {"device", "Speaker"}, {"at", Date{0.5}}});
  ASSERT_TRUE(flush());

  const std::vector<Event> found = events();
  ASSERT_THAT(found, SizeIs(1));
  EXPECT_EQ(found[0].recordedAt, ManualClock::kStart);
  EXPECT_EQ(found[0].name, "com.orvane.telephony.Playback.Stop");
  EXPECT_EQ(found[0].payload, R"({"volume":0.5,"device":"Speaker","at":"1970-01-01T00:00:00.5Z"})");
  EXPECT_THAT(errors(), IsEmpty());
}

// --- Rows of the journal's requests ---

TEST_F(ReportStoreTest, KnowsTheLastRowOfEachUsersRequests) {
  open();
  EXPECT_THAT(store_->marks(), testing::Optional(IsEmpty()));
  const auto recordFor = [&](std::uint32_t user, std::uint64_t sequence, int rows) {
    const std::shared_ptr<Account> account = accounts_.of(user);
    const WorkingFor scope(account);
    JournalPosition position(sequence);
    const JournalPosition::Scope request(position);
    recordNumbered(rows);
  };
  recordFor(1001, 7, 2);
  recordFor(1002, 8, 1);
  ASSERT_TRUE(flush());
  recordFor(1001, 9, 3);
  recordNumbered(1);  // of no request
  ASSERT_TRUE(flush());
  EXPECT_THAT(store_->marks(), testing::Optional(StoreMarks{{1001, {9, 3}}, {1002, {8, 1}}}));
}

TEST_F(ReportStoreTest, LeavesOutWhatItHasWhileTheJournalIsPlayed) {
  open();
  store_->beginPlaying({{1001, {7, 2}}});
  const std::shared_ptr<Account> account = accounts_.of(1001);
  const auto play = [&](std::uint64_t sequence, int rows, int first) {
    const WorkingFor scope(account);
    JournalPosition position(sequence);
    const JournalPosition::Scope request(position);
    recordNumbered(rows, first);
  };
  play(6, 1, 0);
  play(7, 3, 10);  // two of them are there
  play(8, 1, 20);
  recordNumbered(1, 30);  // of no request
  store_->endPlaying();
  recordNumbered(1, 40);
  play(7, 1, 50);
  store_->endRecovery();
  play(7, 1, 60);
  ASSERT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":12})", R"({"n":20})", R"({"n":40})", R"({"n":60})"));
}

// Played sessions have none, so the other rows must have the same numbers with them and without.
TEST_F(ReportStoreTest, RowsOfRealTimeCommunicationDoNotCountAmongThoseOfARequest) {
  open();
  const std::shared_ptr<Account> account = accounts_.of(1001);
  const auto session = std::make_shared<RtcSessionRecord>();
  {
    const WorkingFor scope(account);
    JournalPosition position(7);
    const JournalPosition::Scope request(position);
    store_->record(RtcSessionRow{session});
    store_->record(RtcMessageRow{clock_.now(), session, 4, 1, {{"m", 1}}});
    recordNumbered(2);
    store_->record(RtcMessageRow{clock_.now(), session, 4, 1, {{"m", 2}}});
  }
  ASSERT_TRUE(flush());
  EXPECT_THAT(store_->marks(), testing::Optional(StoreMarks{{1001, {7, 2}}}));
}

// Without them a recovery would record everything twice.
TEST_F(ReportStoreTest, MarksOfAFileThatCannotBeOpenedForAMomentAreReadAllTheSame) {
  open();
  {
    const std::shared_ptr<Account> account = accounts_.of(1001);
    const WorkingFor scope(account);
    JournalPosition position(7);
    const JournalPosition::Scope request(position);
    recordNumbered(1);
  }
  ASSERT_TRUE(flush());
  int failures = 6;
  std::optional<StoreMarks> marks;
  const bool isTried = runIntercepted(
      SYS_openat, [&failures](const seccomp_data&) { return failures-- > 0 ? EMFILE : 0; },
      [&] { marks = store_->marks(); });
  if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
  EXPECT_LT(failures, 0);
  EXPECT_THAT(marks, testing::Optional(StoreMarks{{1001, {7, 1}}}));
}

TEST_F(ReportStoreTest, CallsWhatMustHappenBeforeEachTransaction) {
  std::atomic<int> calls = 0;
  std::int64_t rows = -1;
  beforeWriting_ = [&] {
    ++calls;
    if (std::filesystem::exists(file_)) rows = number("SELECT count(*) FROM analytics_row");
  };
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  const int before = calls;
  recordNumbered(1);
  ASSERT_TRUE(flush());
  EXPECT_EQ(calls, before + 1);
  EXPECT_EQ(rows, 1);
}

TEST_F(ReportStoreTest, BringsWhatIsWrittenToTheDiskAndSaysWhenThatFails) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(store_->sync());
  bool isSynced = true;
  const bool isTried = runIntercepted(
      SYS_fdatasync, [](const seccomp_data&) { return EIO; }, [&] { isSynced = store_->sync(); });
  if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
  EXPECT_FALSE(isSynced);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot bring " + file_ + "-wal to the disk: ")));
}

// A sync closed a descriptor of the file, which took SQLite's locks on it from the process. The next program
// that wrote to the store and closed it removed the write-ahead log, and the store wrote on into nothing.
TEST_F(ReportStoreTest, KeepsItsLocksOnTheFileWhenItSyncs) {
  const auto isLocked = [this] {
    const int file = ::open(file_.c_str(), O_RDWR | O_CLOEXEC);  // to close it would take the locks, too
    struct flock lock {};
    lock.l_type = F_WRLCK;
    EXPECT_EQ(::fcntl(file, F_OFD_GETLK, &lock), 0);
    openFiles_.emplace_back(file);
    return lock.l_type != F_UNLCK;
  };
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  ASSERT_TRUE(isLocked());
  ASSERT_TRUE(store_->sync());
  EXPECT_TRUE(isLocked());
  ASSERT_TRUE(store_->sync());
  EXPECT_TRUE(isLocked());
}

TEST_F(ReportStoreTest, SyncsTheFileThatTookThePlaceOfTheFirst) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  ASSERT_TRUE(store_->sync());
  for (const char* end : {"", "-wal", "-shm"}) std::filesystem::remove(file_ + end);
  EXPECT_TRUE(store_->sync());
  recordNumbered(1);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(store_->sync());
  EXPECT_THAT(payloads(), SizeIs(1));
}

TEST_F(ReportStoreTest, SaysWhenRowsAreWritten) {
  open();
  EXPECT_TRUE(store_->hasWritten(store_->recordedRows()));
  recordNumbered(3);
  EXPECT_EQ(store_->recordedRows(), 3U);
  ASSERT_TRUE(flush());
  EXPECT_TRUE(store_->hasWritten(3));
  EXPECT_FALSE(store_->hasWritten(4));
}

TEST_F(ReportStoreTest, KeepsEventsInTheOrderOfRecording) {
  open();
  recordNumbered(2500);
  ASSERT_TRUE(flush());

  const std::vector<Event> found = events();
  ASSERT_THAT(found, SizeIs(2500));
  for (int n = 0; n < 2500; ++n) {
    EXPECT_EQ(found[static_cast<std::size_t>(n)].payload, "{\"n\":" + std::to_string(n) + "}");
  }
}

TEST_F(ReportStoreTest, WritesAnEventWithTwoNamesAsOneRow) {
  open();
  const ValueMap payload{{"volume", 0.5}};
  record({"com.orvane.tonewerk.Playback.Stop", "com.orvane.telephony.Playback.Stop"}, payload);
  record("com.orvane.tonewerk.Playback.Stop", payload);
  ASSERT_TRUE(flush());

  EXPECT_EQ(number("SELECT count(*) FROM analytics_row"), 2);
  const std::vector<Event> found = events();
  ASSERT_THAT(found, SizeIs(3));
  EXPECT_EQ(found[0].name, "com.orvane.tonewerk.Playback.Stop");
  EXPECT_EQ(found[1].name, "com.orvane.telephony.Playback.Stop");
  EXPECT_EQ(found[2].name, "com.orvane.tonewerk.Playback.Stop");
  EXPECT_LT(found[0].id, found[1].id);
  EXPECT_LT(found[1].id, found[2].id);
  EXPECT_EQ(found[0].payload, found[1].payload);
}

TEST_F(ReportStoreTest, KeepsTheTimesOfEqualPayloadsRecordedApart) {
  open();
  const ValueMap payload{{"volume", 0.5}};
  record("com.orvane.a", payload);
  clock_.advance(2.0);
  record("com.orvane.b", payload);
  ASSERT_TRUE(flush());

  const std::vector<Event> found = events();
  ASSERT_THAT(found, SizeIs(2));
  EXPECT_EQ(found[1].recordedAt, ManualClock::kStart + 2.0);
}

TEST_F(ReportStoreTest, KeepsMetricRecordsByteForByteBetweenEvents) {
  open();
  record("com.orvane.a", {{"n", 1}});
  store_->record(MetricRow{clock_.now(), 0x5B0003, std::string("\x10\x00\x1a", 3)});
  record("com.orvane.b", {{"n", 2}});
  ASSERT_TRUE(flush());
  SqliteDatabase database;
  ASSERT_TRUE(database.open(file(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  SqliteStatement select = database.prepare("SELECT posted_at, identifier, record FROM metric");
  ASSERT_EQ(select.step(), SqliteStatement::Step::kRow);
  EXPECT_EQ(select.number(0), clock_.now());
  EXPECT_EQ(select.integer(1), 0x5B0003);
  EXPECT_EQ(select.bytes(2), std::string("\x10\x00\x1a", 3));
  EXPECT_EQ(select.step(), SqliteStatement::Step::kDone);
  EXPECT_THAT(events(), SizeIs(2));
}

TEST_F(ReportStoreTest, KeepsTextsOfAllSizes) {
  open();
  std::vector<std::string> expected;
  for (const std::size_t size :
       std::initializer_list<std::size_t>{0, 1, 100, 8100, 8192, 600'000, 3'000'000, 2}) {
    const std::string text(size, 'x');
    record("com.orvane.n", {{"text", text}});
    store_->record(MetricRow{clock_.now(), 1, text});
    expected.push_back(R"({"text":")" + text + R"("})");
  }
  ASSERT_TRUE(flush());
  EXPECT_EQ(payloads(), expected);
  EXPECT_EQ(number("SELECT sum(length(record)) FROM metric"),
            0 + 1 + 100 + 8100 + 8192 + 600'000 + 3'000'000 + 2);
  EXPECT_EQ(number("SELECT count(*) FROM metric WHERE typeof(record) = 'blob'"), 8);
}

TEST_F(ReportStoreTest, UsesKnownNamesAgainAfterARestart) {
  for (int run = 0; run < 2; ++run) {
    open();
    record("com.orvane.single", {{"n", 1}});
    record({"com.orvane.first", "com.orvane.second"}, {{"n", 2}});
    ASSERT_TRUE(flush());
    close();
  }
  EXPECT_THAT(events("name = 'com.orvane.second'"), SizeIs(2));
  EXPECT_THAT(events("name = 'com.orvane.single'"), SizeIs(2));
  EXPECT_EQ(number("SELECT count(*) FROM analytics_name"), 3);
}

TEST_F(ReportStoreTest, WritesWithoutBeingAsked) {
  open();
  recordNumbered(1);

  SqliteDatabase reader;
  ASSERT_TRUE(flush());  // the file is there
  ASSERT_TRUE(reader.open(file(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  recordNumbered(1, 1);
  const auto deadline = std::chrono::steady_clock::now() + kLongEnough;
  while (reader.number("SELECT count(*) FROM analytics_event") != 2) {
    ASSERT_LT(std::chrono::steady_clock::now(), deadline);
    std::this_thread::yield();
  }
}

TEST_F(ReportStoreTest, WritesTheRemainingRowsWhenItEnds) {
  open();
  recordNumbered(3000);
  close();
  EXPECT_THAT(events(), SizeIs(3000));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(ReportStoreTest, MakesTheWholeSchema) {
  open();
  ASSERT_TRUE(flush());
  recordNumbered(1);
  ASSERT_TRUE(flush());

  EXPECT_EQ(number("PRAGMA user_version"), 3);
  EXPECT_EQ(number("PRAGMA auto_vacuum"), 2);
  EXPECT_EQ(number("SELECT count(*) FROM (SELECT id, posted_at, identifier, record FROM metric)"), 0);
  EXPECT_EQ(
      number("SELECT count(*) FROM (SELECT id, recorded_at, event_group, name, payload FROM power_event)"),
      0);
  EXPECT_EQ(number("SELECT count(*) FROM (SELECT id, started_at, session_info, user_info FROM rtc_session)"),
            0);
  EXPECT_EQ(
      number(
          "SELECT count(*) FROM (SELECT id, sent_at, rtc_session, category, type, payload FROM rtc_message)"),
      0);
}

TEST_F(ReportStoreTest, EachRowHasTheUserForWhomTheThreadWorked) {
  open();
  const auto session = std::make_shared<RtcSessionRecord>();
  const auto recordOneOfEach = [&] {
    record("com.orvane.n", {{"n", 1}});
    store_->record(MetricRow{clock_.now(), 1, "record"});
    recordPower(1);
    store_->record(RtcMessageRow{clock_.now(), session, 4, 1, {{"n", 2}}});
  };
  {
    const std::shared_ptr<Account> account = accounts_.of(1001);
    const WorkingFor scope(account);
    store_->record(RtcSessionRow{session});
    recordOneOfEach();
  }
  recordOneOfEach();
  ASSERT_TRUE(flush());
  for (const char* table : {"analytics_row", "metric", "power_event", "rtc_row"}) {
    const std::string from = " FROM " + std::string(table);
    EXPECT_EQ(number("SELECT count(*)" + from), 2) << table;
    EXPECT_EQ(number("SELECT user_id" + from + " WHERE id = 1"), 1001) << table;
    EXPECT_EQ(number("SELECT user_id IS NULL" + from + " WHERE id = 2"), 1) << table;
  }
  EXPECT_EQ(number("SELECT user_id FROM rtc_session"), 1001);
}

TEST_F(ReportStoreTest, TheUserIsInNoView) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  EXPECT_EQ(number("SELECT count(*) FROM pragma_table_info('analytics_event')"), 4);
  EXPECT_EQ(number("SELECT count(*) FROM pragma_table_info('rtc_message')"), 6);
}

TEST_F(ReportStoreTest, TakesEventsFromManyThreads) {
  ReportStore::Limits limits;
  limits.rows = 64;
  limits.batchRows = 16;
  limits.hold = kLongEnough;
  open(limits);
  std::vector<std::thread> producers;
  producers.reserve(4);
  for (int producer = 0; producer < 4; ++producer) {
    producers.emplace_back([this, producer] { recordNumbered(500, producer * 1000); });
  }
  for (std::thread& producer : producers) producer.join();
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(2000));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(ReportStoreTest, CanBeReadWhileItWrites) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  std::atomic<bool> done{false};
  std::thread writer([&] {
    recordNumbered(5000, 1);
    EXPECT_TRUE(flush());
    done = true;
  });
  std::int64_t last = 0;
  while (!done) {
    const std::int64_t count = number("SELECT count(*) FROM analytics_event");
    EXPECT_GE(count, last);
    last = count;
  }
  writer.join();
  EXPECT_EQ(number("SELECT count(*) FROM analytics_event"), 5001);
}

// A file is at the path of the directory, so that root cannot write there either.
class BrokenReportStoreTest : public ReportStoreTest {
 protected:
  BrokenReportStoreTest() { blockDirectory(); }
  void blockDirectory() { std::ofstream(directory_) << "in the way"; }
  void repairDirectory() { std::filesystem::remove(directory_); }

  ReportStore::Limits small() {
    ReportStore::Limits limits;
    limits.rows = 4;
    limits.hold = kLongEnough;
    return limits;
  }
};

TEST_F(BrokenReportStoreTest, LogsOnceThatItCannotWrite) {
  open();
  recordNumbered(1);
  EXPECT_FALSE(flush());
  recordNumbered(1);
  EXPECT_FALSE(flush());
  EXPECT_THAT(errors(), ElementsAre(AllOf(HasSubstr("cannot write"), HasSubstr(file()))));
}

TEST_F(BrokenReportStoreTest, WritesTheKeptRowsWhenTheDiskWorksAgain) {
  open();
  recordNumbered(3);
  EXPECT_FALSE(flush());
  repairDirectory();
  EXPECT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":0})", R"({"n":1})", R"({"n":2})"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot write"), HasSubstr("rows dropped meanwhile: 0")));
}

TEST_F(BrokenReportStoreTest, NeverMakesRecordingWaitAndCountsTheRowsItDrops) {
  open(small());
  recordNumbered(10);  // returns, although only four fit and nothing is written
  EXPECT_FALSE(flush());
  repairDirectory();
  EXPECT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":0})", R"({"n":1})", R"({"n":2})", R"({"n":3})"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot write"), HasSubstr("rows dropped meanwhile: 6")));
}

TEST_F(BrokenReportStoreTest, ChargesNobodyUntilItWritesAgain) {
  const std::shared_ptr<Account> account = accounts_.of(1001);
  open(small());
  EXPECT_EQ(accounts_.totals().total(Resource::kSinkBytes), small().bytes);
  {
    const WorkingFor scope(account);
    recordNumbered(2);
    EXPECT_FALSE(flush());
    EXPECT_EQ(account->held(Resource::kSinkBytes), 0U);
    recordNumbered(8, 2);
    EXPECT_EQ(account->held(Resource::kSinkBytes), 0U);
    EXPECT_EQ(account->refused(Resource::kSinkBytes), 8U);  // the rows of one user fill half of the queue
  }
  recordNumbered(1, 10);
  repairDirectory();
  EXPECT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":0})", R"({"n":1})", R"({"n":10})"));
  EXPECT_EQ(account->held(Resource::kSinkBytes), 0U);
}

TEST_F(BrokenReportStoreTest, CountsTheLostRowsAtTheEnd) {
  open(small());
  recordNumbered(10);
  close();
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot write"),
                                    HasSubstr("could not be written to " + file() + ": 10")));
}

TEST_F(BrokenReportStoreTest, LogsAgainWhenItBreaksAgain) {
  open();
  recordNumbered(1);
  EXPECT_FALSE(flush());
  repairDirectory();
  recordNumbered(1);
  EXPECT_TRUE(flush());
  std::filesystem::remove_all(directory_);
  blockDirectory();
  recordNumbered(1);
  EXPECT_FALSE(flush());
  EXPECT_THAT(errors(),
              ElementsAre(HasSubstr("cannot write"), HasSubstr("goes on"), HasSubstr("cannot write")));
}

TEST_F(ReportStoreTest, MakesANewFileWhenTheFileWasRemoved) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  std::filesystem::remove_all(directory_);
  recordNumbered(1, 1);
  ASSERT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":1})"));
}

TEST_F(ReportStoreTest, ContinuesWhereItWasWhenAFullDiskHasRoomAgain) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  {
    const FullDisk full(4096);
    recordNumbered(2000, 1);
    EXPECT_FALSE(flush());
    EXPECT_THAT(errors(), ElementsAre(HasSubstr("cannot write")));
  }
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(2001));
  EXPECT_EQ(payloads().back(), R"({"n":2000})");
  EXPECT_FALSE(std::filesystem::exists(file() + ".corrupt"));
}

TEST_F(ReportStoreTest, WaitsForAnotherWriter) {
  open();
  ASSERT_TRUE(flush());
  recordNumbered(1);
  ASSERT_TRUE(flush());
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(other.run("BEGIN IMMEDIATE"));
  recordNumbered(1, 1);
  EXPECT_FALSE(flush());
  ASSERT_TRUE(other.run("ROLLBACK"));
  EXPECT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(2));
}

TEST_F(ReportStoreTest, MovesAFileThatIsNoDatabaseAside) {
  std::filesystem::create_directories(directory_);
  std::ofstream(file()) << std::string(100'000, 'x');
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(1));
  EXPECT_EQ(std::filesystem::file_size(file() + ".corrupt"), 100'000U);
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("damaged")));
}

TEST_F(ReportStoreTest, MovesADamagedDatabaseAsideAndKeepsTheRowsToBeWritten) {
  open();
  recordNumbered(2000);
  ASSERT_TRUE(flush());
  close();
  {
    std::fstream damaged(file(), std::ios::in | std::ios::out | std::ios::binary);
    const std::string garbage(std::filesystem::file_size(file()) - 200, '\xff');
    damaged.seekp(200);
    damaged << garbage;
  }
  open();
  recordNumbered(3);
  ASSERT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":0})", R"({"n":1})", R"({"n":2})"));
  EXPECT_TRUE(std::filesystem::exists(file() + ".corrupt"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("damaged")));
}

TEST_F(ReportStoreTest, LogsOnceThatTheRowsOfADamagedFileCannotBeSaved) {
  open();
  recordNumbered(2000);
  ASSERT_TRUE(flush());
  close();
  const std::int64_t page = number("SELECT rootpage FROM sqlite_master WHERE name = 'power_event'");
  {
    std::fstream damaged(file(), std::ios::in | std::ios::out | std::ios::binary);
    damaged.seekp((page - 1) * 8192);
    damaged << std::string(8192, '\xff');
  }
  {
    const FullDisk full(std::filesystem::file_size(file()) / 2);
    open();
    recordNumbered(3);
    EXPECT_FALSE(flush());
    EXPECT_FALSE(flush());
    EXPECT_THAT(errors(), ElementsAre(AllOf(HasSubstr("malformed"), HasSubstr("cannot be saved"))));
  }
  clock_.advance(StoreDatabase::kSalvageInterval);
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(2003));
}

// One table is damaged, and the rest of the file can be read.
class DamagedTableTest : public ReportStoreTest, public testing::WithParamInterface<std::string> {
 protected:
  // Makes a file with some rows and overwrites the first page of the table.
  void makeDamagedFile() {
    open();
    recordNumbered(100);
    ASSERT_TRUE(flush());
    close();
    const std::int64_t pageBytes = number("PRAGMA page_size");
    const std::int64_t page = number("SELECT rootpage FROM sqlite_master WHERE name = '" + GetParam() + "'");
    ASSERT_GT(page, 1);
    std::fstream damaged(file(), std::ios::in | std::ios::out | std::ios::binary);
    damaged.seekp((page - 1) * pageBytes);
    damaged << std::string(static_cast<std::size_t>(pageBytes), '\xff');
  }
};

INSTANTIATE_TEST_SUITE_P(Store, DamagedTableTest, testing::Values("analytics_row", "rtc_row"),
                         [](const auto& info) { return info.param; });

// The file is put in place while the store runs. When the store starts, the check of the age is the first to
// use the tables and finds the damage.
TEST_P(DamagedTableTest, TheFileIsMovedAsideWhenNewRowsAreNumbered) {
  makeDamagedFile();
  const std::string damaged = temporary_.path("damaged.db");
  std::filesystem::rename(file(), damaged);
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());  // the store has made its files
  std::filesystem::rename(directory_, temporary_.path("before"));
  std::filesystem::create_directories(directory_);
  std::filesystem::rename(damaged, file());
  recordNumbered(1, 1000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(payloads().back(), R"({"n":1000})");
  EXPECT_THAT(payloads(), SizeIs(GetParam() == "rtc_row" ? 101 : 1));
  EXPECT_TRUE(std::filesystem::exists(file() + ".corrupt"));
  // Depending on the moment, a write to the old file fails first.
  EXPECT_THAT(errors(), testing::Contains(HasSubstr("is damaged (database disk image is malformed)")));
  EXPECT_THAT(errors(), Each(testing::Not(HasSubstr("not an error"))));
}

TEST_F(ReportStoreTest, ReportsWhyAFileCannotBeWrittenThatLacksATable) {
  open();
  ASSERT_TRUE(flush());
  close();
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(other.run("DROP VIEW rtc_message; DROP VIEW analytics_event; DROP TABLE analytics_row"));
  other.close();
  open();
  recordNumbered(1);
  EXPECT_FALSE(flush());
  EXPECT_THAT(errors(),
              testing::Contains(HasSubstr("cannot write " + file() + ": no such table: analytics_row")));
}

TEST_F(ReportStoreTest, LeavesAFileOfANewerVersionAloneAndBeginsOneBesideIt) {
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  close();
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(other.run("PRAGMA user_version = 4"));
  other.close();
  const std::string before = contentsOf(file());

  for (int run = 1; run <= 2; ++run) {
    open();
    recordNumbered(1, run);
    EXPECT_TRUE(flush());
    close();
  }
  EXPECT_EQ(contentsOf(file()), before);
  EXPECT_FALSE(std::filesystem::exists(file() + "-wal"));
  EXPECT_THAT(errors(), testing::Contains(AllOf(HasSubstr("reports.3.db is used"),
                                                HasSubstr("newer version made the reports.db beside it"),
                                                HasSubstr("(schema 4)")))
                            .Times(2));
  file_ = directory_ + "/reports.3.db";
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":1})", R"({"n":2})"));
}

// A newer daemon that was killed leaves the version, and rows, in the write-ahead log.
TEST_F(ReportStoreTest, LeavesAFileAloneWhoseNewerVersionIsInItsLog) {
  open();
  ASSERT_TRUE(flush());
  close();
  const std::string copy = temporary_.path("killed");
  {
    SqliteDatabase other;
    ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
    ASSERT_TRUE(other.run("PRAGMA user_version = 4"));
    std::filesystem::copy(directory_, copy);
  }
  directory_ = copy;
  file_ = copy + "/reports.db";
  const std::string before = contentsOf(file()) + contentsOf(file() + "-wal");
  ASSERT_FALSE(contentsOf(file() + "-wal").empty());
  open();
  recordNumbered(1);
  EXPECT_TRUE(flush());
  close();
  EXPECT_EQ(contentsOf(file()) + contentsOf(file() + "-wal"), before);
  EXPECT_EQ(number("PRAGMA user_version"), 4);
  file_ = copy + "/reports.3.db";
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":0})"));
}

TEST_F(ReportStoreTest, DeletesRowsThatAreOlderThanTheBound) {
  open();
  recordNumbered(700);
  ASSERT_TRUE(flush());
  clock_.advance(20 * kDay);
  recordNumbered(10, 1000);
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(710));

  clock_.advance(11 * kDay);
  recordNumbered(1, 2000);
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(11));
}

TEST_F(ReportStoreTest, AJumpOfTheWallClockErasesNothingAndIsLoggedOnceBothWays) {
  open();
  recordNumbered(5);
  ASSERT_TRUE(flush());
  for (const double jump : {40 * kDay, -40 * kDay}) {
    clock_.setNow(clock_.now() + jump);
    for (int times = 0; times < 3; ++times) {
      clock_.advance(11.0);
      recordNumbered(1, 5);
      ASSERT_TRUE(flush());
    }
  }
  EXPECT_THAT(events(), SizeIs(11));
  EXPECT_THAT(log_.textsOf("twrs", LogLevel::kDefault),
              ElementsAre(HasSubstr("the wall clock jumped forward by 3456000 s"),
                          HasSubstr("the wall clock jumped back by 3456000 s")));
}

TEST_F(ReportStoreTest, TakesTheDaysFromThePreferences) {
  preferences_.configure("com.orvane.tonewerk.store", "max_days", 2);
  open();
  recordNumbered(5);
  ASSERT_TRUE(flush());
  clock_.advance(3 * kDay);
  recordNumbered(1, 5);
  ASSERT_TRUE(flush());
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":5})"));
}

TEST_F(ReportStoreTest, NeverUsesAnIdentifierAgain) {
  open();
  recordNumbered(3);
  ASSERT_TRUE(flush());
  const std::int64_t last = events().back().id;
  close();
  clock_.advance(31 * kDay);
  open();
  recordNumbered(1, 3);
  ASSERT_TRUE(flush());
  clock_.advance(60.0);
  recordNumbered(1, 4);
  ASSERT_TRUE(flush());
  ASSERT_THAT(payloads(), ElementsAre(R"({"n":3})", R"({"n":4})"));
  EXPECT_GT(events().front().id, last);
}

TEST_F(ReportStoreTest, KeepsTheFileWithinItsBoundByDeletingTheOldest) {
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 2);
  open();
  const std::string text(1000, 'x');
  for (int n = 0; n < 6000; ++n) {
    clock_.advance(0.01);
    record("com.orvane.n", {{"n", n}, {"text", text}});
  }
  ASSERT_TRUE(flush());

  const std::vector<Event> found = events();
  EXPECT_THAT(found.back().payload, HasSubstr("\"n\":5999,"));
  EXPECT_GT(found.size(), 900U);
  EXPECT_LT(found.size(), 2000U);
  close();
  EXPECT_LE(std::filesystem::file_size(file()), 2U << 20);
}

TEST_F(ReportStoreTest, ShrinksTheFileWhenTheBoundIsLowered) {
  open();
  const std::string text(1000, 'x');
  for (int n = 0; n < 6000; ++n) record("com.orvane.n", {{"n", n}, {"text", text}});
  ASSERT_TRUE(flush());
  EXPECT_GT(number("PRAGMA page_count") * number("PRAGMA page_size"), 5 << 20);
  close();

  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 1);
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  close();
  EXPECT_LE(std::filesystem::file_size(file()), 1U << 20);
  EXPECT_THAT(events(), Each(testing::Field(&Event::name, "com.orvane.n")));
  EXPECT_GT(events().size(), 300U);
}

TEST_F(ReportStoreTest, DeletesTheOldestRowsOfEveryTable) {
  open();
  ASSERT_TRUE(flush());
  recordNumbered(1);
  ASSERT_TRUE(flush());
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  for (int n = 1; n <= 2; ++n) {
    const std::string now = std::to_string(clock_.now());
    ASSERT_TRUE(other.run("INSERT INTO metric (posted_at, identifier, record) VALUES (" + now + ", 1, '')"));
    ASSERT_TRUE(other.run("INSERT INTO rtc_row (id, sent_at, rtc_session, category, type, payload) VALUES (" +
                          std::to_string(n) + ", " + now + ", 1, 1, 1, '{}')"));
    clock_.advance(n == 1 ? 31 * kDay : kDay);
    recordNumbered(1, n);
    ASSERT_TRUE(flush());
  }
  EXPECT_EQ(number("SELECT count(*) FROM metric"), 1);
  EXPECT_EQ(number("SELECT count(*) FROM rtc_message"), 1);
  EXPECT_THAT(payloads(), ElementsAre(R"({"n":1})", R"({"n":2})"));
}

TEST_F(ReportStoreTest, KeepsPowerEventsBetweenAnalyticsEventsInTheirOrder) {
  open();
  for (int n = 0; n < 600; ++n) {
    recordNumbered(1, n);
    recordPower(n);
  }
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(600));
  EXPECT_EQ(number("SELECT count(*) FROM power_event"), 600);
  EXPECT_EQ(number("SELECT count(*) FROM power_event WHERE payload ->> 'n' <> id - 1"), 0);
}

TEST_F(ReportStoreTest, KeepsTheOrderWithinEachTableWhenRowsOfAllTablesAreMixed) {
  ReportStore::Limits limits;
  limits.batchRows = 70;
  open(limits);
  std::vector<std::shared_ptr<RtcSessionRecord>> sessions;
  for (int n = 0; n < 1000; ++n) {
    record(n % 2 == 0 ? EventNames("a", "b") : EventNames("a"), {{"n", n}});
    store_->record(MetricRow{clock_.now(), static_cast<std::uint32_t>(n), "record"});
    recordPower(n);
    if (n % 100 == 0) {
      sessions.push_back(std::make_shared<RtcSessionRecord>());
      sessions.back()->startedAt = n;
      store_->record(RtcSessionRow{sessions.back()});
    }
    const auto& session = sessions[static_cast<std::size_t>(n) % sessions.size()];
    store_->record(RtcMessageRow{clock_.now(), session, 4, 1, {{"n", n}, {"session", session->startedAt}}});
  }
  ASSERT_TRUE(flush());

  EXPECT_EQ(number("SELECT count(*) FROM analytics_row WHERE payload ->> 'n' = id - 1"), 1000);
  EXPECT_EQ(number("SELECT count(*) FROM analytics_event"), 1500);
  EXPECT_EQ(number("SELECT count(*) FROM metric WHERE identifier = id - 1 AND record = x'7265636f7264'"),
            1000);
  EXPECT_EQ(number("SELECT count(*) FROM power_event WHERE payload ->> 'n' = id - 1"), 1000);
  EXPECT_EQ(number("SELECT count(*) FROM rtc_session WHERE started_at = 100 * (id - 1)"), 10);
  EXPECT_EQ(number("SELECT count(*) FROM rtc_message AS m JOIN rtc_session AS s ON s.id = m.rtc_session"
                   " WHERE m.payload ->> 'n' = m.id - 1 AND m.payload ->> 'session' = s.started_at"),
            1000);
}

TEST_F(ReportStoreTest, DeletesPowerEventsThatAreOlderThanTheBound) {
  open();
  recordPower(1);
  recordPower(2);
  ASSERT_TRUE(flush());
  clock_.advance(20 * kDay);
  recordPower(3);
  ASSERT_TRUE(flush());
  clock_.advance(11 * kDay);
  recordPower(4);
  ASSERT_TRUE(flush());
  EXPECT_EQ(number("SELECT min(payload ->> 'n') FROM power_event"), 3);
  EXPECT_EQ(number("SELECT count(*) FROM power_event"), 2);
}

TEST_F(ReportStoreTest, DeletesTheOldestPowerEventsToKeepTheFileWithinItsBound) {
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 2);
  open();
  const std::string text(1000, 'x');
  for (int n = 0; n < 6000; ++n) {
    clock_.advance(0.01);
    if (n % 2 == 0) {
      recordPower(n, text);
    } else {
      record("com.orvane.n", {{"n", n}, {"text", text}});
    }
  }
  ASSERT_TRUE(flush());
  const std::int64_t oldest = number("SELECT min(payload ->> 'n') FROM power_event");
  EXPECT_EQ(number("SELECT max(payload ->> 'n') FROM power_event"), 5998);
  EXPECT_EQ(number("SELECT count(*) FROM power_event"), (6000 - oldest) / 2);  // no row between is missing
  EXPECT_GT(oldest, 4000);
  EXPECT_LT(oldest, 5200);
  // The oldest rows of both tables are about equally old.
  EXPECT_NEAR(static_cast<double>(number("SELECT min(payload ->> 'n') FROM analytics_event")),
              static_cast<double>(oldest), 1100.0);
  close();
  EXPECT_LE(std::filesystem::file_size(file()), 2U << 20);
}

// The clock was ahead when they were recorded.
TEST_F(ReportStoreTest, RowsOfATableWithTimesInTheFutureMakeRoomLikeOthers) {
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 2);
  open();
  const std::string text(1000, 'x');
  clock_.setNow(ManualClock::kStart + 400 * kDay);
  for (int n = 0; n < 500; ++n) recordPower(n, text);
  ASSERT_TRUE(flush());
  clock_.setNow(ManualClock::kStart);
  clock_.advance(2 * 3600.0);
  recordNumbered(1);
  ASSERT_TRUE(flush());
  for (int n = 0; n < 6000; ++n) record("com.orvane.n", {{"n", n}, {"text", text}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(number("SELECT count(*) FROM power_event"), 1);  // the newest one stays
  EXPECT_GT(number("SELECT count(*) FROM analytics_event"), 1300);
}

class BoundedReportStoreTest : public ReportStoreTest {
 protected:
  void openBoundedTo(int megabytes) {
    preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", megabytes);
    bounds_.bytes = std::int64_t{megabytes} << 20;
    open();
  }
  // Records a row of that many bytes, in one table or in another.
  void recordRow(int n, std::size_t bytes) {
    clock_.advance(0.01);
    const std::string text(bytes, 'x');
    if (n % 3 == 0) {
      recordPower(n, text);
    } else {
      record("com.orvane.n", {{"n", n}, {"text", text}});
    }
  }
  // The part of the database file's bound that is in use.
  double usedPart() {
    const std::int64_t pages = number("PRAGMA page_count") - number("PRAGMA freelist_count");
    return static_cast<double>(pages * number("PRAGMA page_size")) / static_cast<double>(bounds_.fileBytes());
  }
  // The numbers of all rows that are left in both tables.
  std::vector<std::int64_t> numbersLeft() {
    std::vector<std::int64_t> numbers;
    SqliteDatabase database;
    EXPECT_TRUE(database.open(file(), SqliteDatabase::Mode::kReadOnly, kLongEnough)) << database.problem();
    SqliteStatement select = database.prepare(
        "SELECT payload ->> 'n' AS n FROM analytics_row UNION SELECT payload ->> 'n' FROM power_event "
        "ORDER BY n");
    while (select.step() == SqliteStatement::Step::kRow) numbers.push_back(select.integer(0));
    return numbers;
  }
  // Expects that no row is missing between the oldest one and the last of `count`.
  void expectTheNewestOf(int count) {
    const std::vector<std::int64_t> numbers = numbersLeft();
    ASSERT_FALSE(numbers.empty());
    EXPECT_EQ(numbers.back(), count - 1);
    EXPECT_EQ(numbers.back() - numbers.front(), static_cast<std::int64_t>(numbers.size()) - 1);
  }

  StoreBounds bounds_;
};

// Regression: 500 rows were deleted from each table at a time. With the smallest bound only the newest row
// was left.
TEST_F(BoundedReportStoreTest, KeepsAsManyRowsOfAKilobyteAsTheSmallestBoundHasRoomFor) {
  openBoundedTo(1);
  for (int n = 0; n < 3000; ++n) {
    recordRow(n, 1000);
    if (n % 100 != 99) continue;
    ASSERT_TRUE(flush());
    if (n < 1000) continue;
    EXPECT_GE(usedPart(), 0.9) << "after " << n;
    EXPECT_LE(usedPart(), 1.0) << "after " << n;
  }
  expectTheNewestOf(3000);
  EXPECT_GT(numbersLeft().size(), 450U);
}

TEST_F(BoundedReportStoreTest, DeletesByBytesWhereRowsOfAHundredLieBetweenRowsOfHalfAMegabyte) {
  openBoundedTo(16);
  for (int n = 0; n < 6000; ++n) recordRow(n, n % 100 == 50 ? 500'000 : 100);
  ASSERT_TRUE(flush());
  EXPECT_GE(usedPart(), 0.9);
  EXPECT_LE(usedPart(), 1.0);
  expectTheNewestOf(6000);
}

// A summary of a whole session may be larger than a small bound, and may stay the newest row of its table for
// long.
TEST_F(BoundedReportStoreTest, ANewestRowThatDoesNotFitTheBoundIsEmptiedAndNoOthersAreDeleted) {
  openBoundedTo(1);
  for (int n = 0; n < 400; ++n) record("com.orvane.n", {{"n", n}, {"text", std::string(1000, 'x')}});
  recordPower(1000, std::string(3'000'000, 'x'));
  ASSERT_TRUE(flush());
  for (int n = 400; n < 600; ++n) record("com.orvane.n", {{"n", n}, {"text", std::string(1000, 'x')}});
  ASSERT_TRUE(flush());
  EXPECT_LE(usedPart(), 1.0);
  EXPECT_GT(events().size(), 450U);
  EXPECT_EQ(number("SELECT count(*) FROM power_event WHERE payload = '{}'"), 1);
}

TEST_F(BoundedReportStoreTest, AppliesANewBoundAtOnceWhenItReadsTheBoundsAgain) {
  openBoundedTo(8);
  for (int n = 0; n < 3000; ++n) recordRow(n, 1000);
  ASSERT_TRUE(flush());
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", 1);
  bounds_.bytes = 1 << 20;
  recordRow(3000, 1000);
  ASSERT_TRUE(flush());
  EXPECT_GT(usedPart(), 3.0);  // it is not yet time to read the bound again

  store_->readBoundsAgain();
  recordRow(3001, 1000);
  ASSERT_TRUE(flush());
  close();  // finishes the trimming that was begun
  EXPECT_LE(usedPart(), 1.0);
  expectTheNewestOf(3002);
}

TEST_F(BoundedReportStoreTest, WithAnyRowsBetweenNineTenthsOfTheBoundAndAllOfItIsInUse) {
  for (unsigned seed = 1; seed <= 8; ++seed) {
    SCOPED_TRACE(seed);
    std::mt19937 random(seed);
    // Most rows are small. Some have up to a 30th of the bound. The worst fit is a row of just over a page.
    std::uniform_real_distribution<double> logarithm(2.0, std::log(50'000.0));
    openBoundedTo(2);
    std::size_t written = 0;
    int count = 0;
    while (written < std::size_t{5} << 20) {
      const std::size_t bytes = seed == 8 ? 8300 : static_cast<std::size_t>(std::exp(logarithm(random)));
      written += bytes;
      recordRow(count++, bytes);
    }
    ASSERT_TRUE(flush());
    EXPECT_GE(usedPart(), 0.9);
    EXPECT_LE(usedPart(), 1.0);
    expectTheNewestOf(count);
    close();
    std::filesystem::remove_all(directory_);
  }
}

// Several users record into one store.
class SharedReportStoreTest : public BoundedReportStoreTest {
 protected:
  void recordFor(std::uint32_t user, int n, std::size_t bytes = 1000) {
    const std::shared_ptr<Account> account = accounts_.of(user);
    const WorkingFor scope(account);
    recordRow(n, bytes);
  }
  std::int64_t rowsOf(std::uint32_t user) {
    const std::string is = " WHERE user_id = " + std::to_string(user);
    return number("SELECT (SELECT count(*) FROM analytics_row" + is +
                  ") + (SELECT count(*) FROM power_event" + is + ")");
  }
  // What the rows of the user count, from the file.
  std::uint64_t countedBytesOf(std::uint32_t user) {
    std::int64_t sum = 0;
    for (const StoreTable& table : kStoreTables) {
      sum +=
          number("SELECT coalesce(sum(" + std::string(table.bytes) + " + 32), 0) FROM " +
                 std::string(table.name) + " WHERE coalesce(user_id, 4294967295) = " + std::to_string(user));
    }
    return static_cast<std::uint64_t>(sum);
  }
  std::uint64_t storedBytesOf(std::uint32_t user) { return accounts_.of(user)->held(Resource::kStoredBytes); }
  // Expects that the accounts know exactly what is in the file.
  void expectExactSums() {
    for (const std::uint32_t user : {kFirst, kSecond, kNoUser}) {
      EXPECT_EQ(storedBytesOf(user), countedBytesOf(user)) << user;
    }
  }

  static constexpr std::uint32_t kFirst = 1001;
  static constexpr std::uint32_t kSecond = 1002;
};

TEST_F(SharedReportStoreTest, AFloodOfOneUserErasesNoRowOfAnother) {
  openBoundedTo(2);
  for (int n = 0; n < 300; ++n) recordFor(kFirst, n);
  for (int n = 0; n < 6000; ++n) recordFor(kSecond, n);
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kFirst), 300);
  EXPECT_GT(rowsOf(kSecond), 700);
  EXPECT_GE(usedPart(), 0.9);
  EXPECT_LE(usedPart(), 1.0);
}

TEST_F(SharedReportStoreTest, AFloodOfLargeRowsErasesNoRowOfAnother) {
  openBoundedTo(8);
  for (int n = 0; n < 2000; ++n) recordFor(kFirst, n);
  for (int n = 0; n < 60; ++n) recordFor(kSecond, n, 1'000'000);
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kFirst), 2000);
}

TEST_F(SharedReportStoreTest, AFloodOfSmallRowsErasesNoLargeRowsOfAnother) {
  openBoundedTo(2);
  for (int n = 0; n < 4; ++n) recordFor(kFirst, n, 150'000);
  for (int n = 0; n < 40'000; ++n) recordFor(kSecond, n, 10);
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kFirst), 4);
}

TEST_F(SharedReportStoreTest, AFloodErasesNoRowOfTheDaemonItself) {
  openBoundedTo(2);
  for (int n = 0; n < 300; ++n) recordRow(n, 1000);
  for (int n = 0; n < 6000; ++n) recordFor(kSecond, n);
  ASSERT_TRUE(flush());
  EXPECT_EQ(number("SELECT count(*) FROM analytics_row WHERE user_id IS NULL"), 200);
}

TEST_F(SharedReportStoreTest, OneUserAloneUsesTheWholeFile) {
  openBoundedTo(2);
  for (int n = 0; n < 6000; ++n) recordFor(kFirst, n);
  ASSERT_TRUE(flush());
  expectTheNewestOf(6000);
  EXPECT_GE(usedPart(), 0.9);
  EXPECT_LE(usedPart(), 1.0);
}

// Where the rows of a flood have been deleted between those of another user, pages are half empty.
TEST_F(SharedReportStoreTest, RowsBetweenThoseOfAFloodAreNotErasedAndTakeNoMoreRoomThanTheyNeed) {
  for (const int every : {2, 3, 10}) {
    SCOPED_TRACE(every);
    openBoundedTo(2);
    int n = 0;
    int firsts = 0;
    // The first user gets a third of the file at most.
    while (firsts < 600 && n < 1500) {
      ++firsts;
      recordFor(kFirst, n++, 900);
      for (int other = 1; other < every; ++other) recordFor(kSecond, n++, 900);
    }
    for (const int end = n + 4000; n < end; ++n) recordFor(kSecond, n, 900);
    ASSERT_TRUE(flush());
    EXPECT_EQ(rowsOf(kFirst), firsts);
    EXPECT_GT(rowsOf(kFirst) + rowsOf(kSecond), 1500);
    // The rows that were written again have their contents, and their places between the others.
    EXPECT_EQ(number("SELECT count(*) FROM analytics_row WHERE user_id = 1001 AND payload ->> 'n' % " +
                     std::to_string(every) + " = 0 AND length(payload ->> 'text') = 900"),
              number("SELECT count(*) FROM analytics_row WHERE user_id = 1001"));
    EXPECT_EQ(
        number("SELECT count(*) FROM (SELECT payload ->> 'n' AS n, lag(payload ->> 'n') OVER (ORDER BY id)"
               " AS before FROM analytics_row) WHERE n <= before"),
        0);
    EXPECT_GE(usedPart(), 0.9);
    EXPECT_LE(usedPart(), 1.0);
    EXPECT_EQ(number("SELECT count(*) FROM pragma_integrity_check WHERE integrity_check <> 'ok'"), 0);
    close();
    std::filesystem::remove_all(directory_);
  }
}

TEST_F(SharedReportStoreTest, UsersWhoRecordAlikeKeepEqualPartsOfTheNewestRows) {
  openBoundedTo(2);
  for (int n = 0; n < 6000; ++n) recordFor(n % 4 < 2 ? kFirst : kSecond, n, 900);
  ASSERT_TRUE(flush());
  const std::vector<std::int64_t> numbers = numbersLeft();
  ASSERT_FALSE(numbers.empty());
  EXPECT_EQ(numbers.back(), 5999);
  // They lose rows in turn, so the last rows that went may be newer than the oldest one that is left.
  EXPECT_LE(numbers.back() - numbers.front() + 1 - static_cast<std::int64_t>(numbers.size()), 2);
  EXPECT_NEAR(static_cast<double>(rowsOf(kFirst)), static_cast<double>(rowsOf(kSecond)), 30.0);
}

TEST_F(SharedReportStoreTest, AUserWhoHeldTheWholeFileIsReducedToAPart) {
  openBoundedTo(2);
  for (int n = 0; n < 4000; ++n) recordFor(kFirst, n);
  for (int n = 4000; n < 8000; ++n) recordFor(kSecond, n);
  ASSERT_TRUE(flush());
  EXPECT_NEAR(static_cast<double>(rowsOf(kFirst)), static_cast<double>(rowsOf(kSecond)), 150.0);
  EXPECT_GE(number("SELECT min(payload ->> 'n') FROM power_event WHERE user_id = 1001"), 3000);
}

TEST_F(SharedReportStoreTest, TheAccountsKnowWhatIsInTheFileAfterEachCommit) {
  openBoundedTo(2);
  ASSERT_NE(accounts_.of(kNoUser), nullptr);  // the account is there
  const auto session = std::make_shared<RtcSessionRecord>();
  session->sessionInfo = {{"a", 1}};
  for (int n = 0; n < 3000; ++n) {
    recordFor(n % 5 == 0 ? kFirst : kSecond, n, static_cast<std::size_t>(n % 1700));
    if (n % 7 == 0) recordRow(n, 500);
    if (n % 100 != 99) continue;
    store_->record(MetricRow{clock_.now(), 1, "record"});
    store_->record(RtcMessageRow{clock_.now(), session, 4, 1, {{"n", n}}});
    ASSERT_TRUE(flush());
    expectExactSums();
  }
  EXPECT_EQ(accounts_.totals().total(Resource::kStoredBytes), 2U << 20);
  close();
  EXPECT_EQ(accounts_.totals().held(Resource::kStoredBytes), 0U);
  open();
  recordFor(kFirst, 3000);
  ASSERT_TRUE(flush());
  EXPECT_GT(storedBytesOf(kFirst), 100'000U);
  expectExactSums();
}

TEST_F(SharedReportStoreTest, TheAccountsKnowWhichRowsWentForTheirAge) {
  open();
  for (int n = 0; n < 800; ++n) recordFor(kFirst, n, 10);
  ASSERT_TRUE(flush());
  clock_.advance(20 * kDay);
  recordFor(kSecond, 1);
  ASSERT_TRUE(flush());
  clock_.advance(11 * kDay);
  for (int n = 800; n < 802; ++n) recordFor(kFirst, n, 10);  // one in each table
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kFirst), 2);
  expectExactSums();
}

TEST_F(SharedReportStoreTest, TheAccountsKnowThatANewestRowWasEmptied) {
  openBoundedTo(1);
  recordFor(kFirst, 0, 3'000'000);
  ASSERT_TRUE(flush());
  EXPECT_LT(storedBytesOf(kFirst), 100U);
  expectExactSums();
}

TEST_F(SharedReportStoreTest, AnAccountThatIsMadeLaterIsChargedForTheRowsOfItsUser) {
  open();
  recordFor(kFirst, 1);
  ASSERT_TRUE(flush());
  close();
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(other.run("UPDATE power_event SET user_id = 1002; UPDATE analytics_row SET user_id = 1002"));
  other.close();
  open();
  recordFor(kFirst, 2);
  ASSERT_TRUE(flush());
  EXPECT_EQ(storedBytesOf(kSecond), 0U);
  recordFor(kFirst, 3);
  ASSERT_TRUE(flush());
  EXPECT_GT(storedBytesOf(kSecond), 1000U);
}

// Regression: each failure read all rows again. That changes of another program stay unnoticed shows that the
// rows are not read.
TEST_F(SharedReportStoreTest, AfterAFailureTheRowsAreNotReadAgain) {
  open();
  ASSERT_NE(accounts_.of(kSecond), nullptr);  // the account is there
  for (int n = 0; n < 100; ++n) recordFor(kFirst, n);
  ASSERT_TRUE(flush());
  expectExactSums();
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(other.run("UPDATE power_event SET user_id = 1002; UPDATE analytics_row SET user_id = 1002"));
  ASSERT_TRUE(
      other.run("CREATE TRIGGER refuse BEFORE INSERT ON power_event BEGIN"
                " SELECT RAISE(FAIL, 'refused'); END"));
  recordFor(kFirst, 100);
  recordFor(kSecond, 102);
  EXPECT_FALSE(flush());
  ASSERT_TRUE(other.run("DROP TRIGGER refuse"));
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kSecond), 101);
  EXPECT_GT(storedBytesOf(kFirst), 100'000U);
  EXPECT_LT(storedBytesOf(kSecond), 2'000U);
}

TEST_F(SharedReportStoreTest, ABatchThatFailedCountsOnceWhenItIsWritten) {
  open();
  ASSERT_NE(accounts_.of(kSecond), nullptr);
  for (int n = 0; n < 100; ++n) recordFor(kFirst, n);
  ASSERT_TRUE(flush());
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(
      other.run("CREATE TRIGGER refuse BEFORE INSERT ON power_event BEGIN"
                " SELECT RAISE(FAIL, 'refused'); END"));
  for (int n = 0; n < 10; ++n) recordFor(n % 2 == 0 ? kFirst : kSecond, n);
  EXPECT_FALSE(flush());
  ASSERT_TRUE(other.run("DROP TRIGGER refuse"));
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kSecond), 5);
  expectExactSums();
}

TEST_F(SharedReportStoreTest, TheSumsAreExactAfterATrimThatFailedInTheMiddle) {
  openBoundedTo(2);
  ASSERT_NE(accounts_.of(kSecond), nullptr);
  for (int n = 0; n < 1000; ++n) recordFor(n % 2 == 0 ? kFirst : kSecond, n);
  ASSERT_TRUE(flush());
  SqliteDatabase other;
  ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(
      other.run("CREATE TRIGGER refuse BEFORE DELETE ON power_event BEGIN"
                " SELECT RAISE(FAIL, 'refused'); END"));
  for (int n = 1000; n < 3000; ++n) recordFor(n % 2 == 0 ? kFirst : kSecond, n);
  ASSERT_TRUE(flush());
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("within its bounds: refused")));
  EXPECT_GT(usedPart(), 1.0);
  expectExactSums();
  ASSERT_TRUE(other.run("DROP TRIGGER refuse"));
  for (int n = 3000; n < 3010; ++n) recordFor(kFirst, n);
  ASSERT_TRUE(flush());
  EXPECT_LE(usedPart(), 1.0);
  expectExactSums();
}

TEST_F(SharedReportStoreTest, TheRowsOfAFileThatWasPutInPlaceAreRead) {
  open();
  ASSERT_NE(accounts_.of(kSecond), nullptr);
  for (int n = 0; n < 100; ++n) recordFor(kFirst, n);
  ASSERT_TRUE(flush());
  const std::string saved = temporary_.path("saved");
  {
    SqliteDatabase other;
    ASSERT_TRUE(other.open(file(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
    ASSERT_TRUE(other.run("VACUUM INTO '" + saved + "'"));
  }
  for (int n = 0; n < 200; ++n) recordFor(kSecond, n);
  ASSERT_TRUE(flush());
  for (const char* suffix : {"-wal", "-shm"}) std::filesystem::remove(file() + suffix);
  std::filesystem::rename(saved, file());
  recordFor(kFirst, 100);
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kFirst), 101);
  EXPECT_EQ(rowsOf(kSecond), 0);
  expectExactSums();
}

TEST_F(SharedReportStoreTest, TheRowsOfAFileThatWasRemovedCountNoMore) {
  open();
  for (int n = 0; n < 100; ++n) recordFor(kFirst, n);
  ASSERT_TRUE(flush());
  std::filesystem::remove_all(directory_);
  recordFor(kFirst, 100);
  ASSERT_TRUE(flush());
  EXPECT_EQ(rowsOf(kFirst), 1);
  expectExactSums();
}

// Goes on by some time whenever it is read.
class HurryingClock final : public Clock {
 public:
  explicit HurryingClock(std::chrono::nanoseconds step) : step_(step) {}

  void advance(std::chrono::nanoseconds time) { now_ += time; }
  double now() const override { return ManualClock::kStart; }
  std::chrono::nanoseconds monotonic() const override { return now_ += step_; }
  std::chrono::minutes utcOffset(double /*at*/) const override { return {}; }
  void sleep(std::chrono::nanoseconds /*duration*/) override {}

 private:
  const std::chrono::nanoseconds step_;
  mutable std::chrono::nanoseconds now_{0};
};

class TrimSliceTest : public testing::Test {
 protected:
  // How many slices it takes to delete about eight megabytes of rows on such a clock.
  int slicesFor(std::chrono::nanoseconds step, bool forAge) {
    const TemporaryDirectory directory;
    HurryingClock clock(step);
    const MemoryJsonService json;
    StoreDatabase store(directory.path(), json, clock);
    store.setBounds({});
    StoreBatch batch;
    for (int n = 0; n < 8000; ++n) {
      const PowerRow row{1.0, 28, "power", {{"n", n}, {"text", std::string(1000, 'x')}}};
      batch.add(row, StoreRowText(row));
    }
    EXPECT_EQ(store.write(batch), StoreDatabase::Result::kDone);
    clock.advance(std::chrono::hours(3));
    EXPECT_EQ(store.write({}), StoreDatabase::Result::kDone);
    store.setBounds({.bytes = forAge ? 64 << 20 : 1 << 20, .seconds = 1.0});
    int slices = 0;
    for (bool moreToDo = true; moreToDo; ++slices) {
      moreToDo = false;
      const auto result = forAge ? store.trimAge(moreToDo) : store.trimSize(moreToDo);
      EXPECT_EQ(result, StoreDatabase::Result::kDone);
    }
    return slices;
  }
};

TEST_F(TrimSliceTest, ASliceForTheSizeEndsWhenItsTimeIsOver) {
  const int slicesWithoutTime = slicesFor(StoreTrimmer::kSliceTime, false);
  EXPECT_GE(slicesWithoutTime, 4);
  EXPECT_LE(slicesWithoutTime, 20);
  EXPECT_LT(slicesFor(std::chrono::nanoseconds(0), false), 4);
}

TEST_F(TrimSliceTest, ASliceForTheAgeEndsWhenItsTimeIsOver) {
  EXPECT_GE(slicesFor(StoreTrimmer::kSliceTime, true), 16);
  EXPECT_LE(slicesFor(std::chrono::nanoseconds(0), true), 2);
}

// A clock without time for more than one round must not let the file grow.
TEST_F(TrimSliceTest, EverySliceFreesMoreThanABatchAddsWhileTheFileIsOverItsBound) {
  const TemporaryDirectory directory;
  const HurryingClock clock(StoreTrimmer::kSliceTime);
  const MemoryJsonService json;
  StoreDatabase store(directory.path(), json, clock);
  const StoreBounds bounds{.bytes = 2 << 20};
  store.setBounds(bounds);
  for (int number = 0; number < 20; ++number) {
    StoreBatch batch;
    for (int n = 0; n < 500; ++n) {
      const PowerRow row{1.0, 28, "power", {{"n", n}, {"text", std::string(1000, 'x')}}};
      batch.add(row, StoreRowText(row));
    }
    ASSERT_EQ(store.write(batch), StoreDatabase::Result::kDone);
    bool moreToDo = false;
    ASSERT_EQ(store.trimSize(moreToDo), StoreDatabase::Result::kDone);
    SqliteDatabase other;
    ASSERT_TRUE(other.open(store.path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
    const std::int64_t pages =
        other.number("PRAGMA page_count").value_or(0) - other.number("PRAGMA freelist_count").value_or(0);
    EXPECT_LE(pages * other.number("PRAGMA page_size").value_or(0), bounds.fileBytes());
  }
}

TEST_F(ReportStoreTest, IgnoresBoundsThatAreNoNumberFromOne) {
  preferences_.configure("com.orvane.tonewerk.store", "max_megabytes", "much");
  preferences_.configure("com.orvane.tonewerk.store", "max_days", 0);
  open();
  recordNumbered(1);
  ASSERT_TRUE(flush());
  clock_.advance(60.0);
  recordNumbered(1, 1);
  ASSERT_TRUE(flush());
  EXPECT_THAT(events(), SizeIs(2));
  EXPECT_THAT(errors(), ElementsAre(AllOf(HasSubstr("max_megabytes = much"), HasSubstr("max_days = 0"))));
}

// Preferences whose reading hangs, as on a disk that does not answer, until `goOn` is set.
class HangingPreferences final : public PreferenceStore {
 public:
  std::optional<Value> read(std::string_view /*domain*/, std::string_view /*key*/) const override {
    while (!goOn) std::this_thread::yield();
    return std::nullopt;
  }
  ValueMap readAll(std::string_view /*domain*/) const override { return {}; }
  std::error_code write(std::string_view /*domain*/, std::string_view /*key*/, const Value& /*value*/,
                        std::string* /*problem*/) override {
    return std::make_error_code(std::errc::io_error);
  }
  std::error_code remove(std::string_view /*domain*/, std::string_view /*key*/,
                         std::string* /*problem*/) override {
    return std::make_error_code(std::errc::io_error);
  }

  std::atomic<bool> goOn = false;
};

// The store's thread may be putting a file in place that a damaged one's rows were saved to.
TEST_F(ReportStoreTest, TheMarksAreReadWhenTheFileHasBeenOpened) {
  open();
  {
    const std::shared_ptr<Account> account = accounts_.of(1001);
    const WorkingFor scope(account);
    JournalPosition position(7);
    const JournalPosition::Scope request(position);
    recordNumbered(1);
  }
  ASSERT_TRUE(flush());
  close();
  std::filesystem::rename(file(), file() + ".salvaged");
  HangingPreferences hanging;
  ReportStore store(directory_, json_, hanging, clock_, accounts_, category_);
  std::atomic<bool> asks = false;
  std::thread opening([&] {
    while (!asks) std::this_thread::yield();
    hanging.goOn = true;
  });
  asks = true;
  EXPECT_THAT(store.marks(), testing::Optional(StoreMarks{{1001, {7, 1}}}));
  opening.join();
}

void waitForRest(const ReportStore& store) {
  while (store.heartbeat()->read().isWorking) std::this_thread::yield();
}

TEST_F(ReportStoreTest, ItsHeartbeatRestsWithoutRowsAndBeatsWithEachBatch) {
  open();
  EXPECT_TRUE(flush());
  waitForRest(*store_);
  const std::uint64_t before = store_->heartbeat()->read().beats;
  recordNumbered(1);
  EXPECT_TRUE(flush());
  waitForRest(*store_);
  EXPECT_GT(store_->heartbeat()->read().beats, before);
}

TEST_F(ReportStoreTest, ItsHeartbeatStandsStillWhileWhatItCallsHangs) {
  HangingPreferences hanging;
  ReportStore store(directory_, json_, hanging, clock_, accounts_, category_);
  while (!store.heartbeat()->read().isWorking) std::this_thread::yield();
  const std::uint64_t before = store.heartbeat()->read().beats;
  store.record(PowerRow{clock_.now(), 28, "power", {{"n", 1}}});
  EXPECT_FALSE(store.flush(std::chrono::milliseconds(0)));
  EXPECT_TRUE(store.heartbeat()->read().isWorking);
  EXPECT_EQ(store.heartbeat()->read().beats, before);
  hanging.goOn = true;
  EXPECT_TRUE(store.flush(kLongEnough));
  EXPECT_GT(store.heartbeat()->read().beats, before);
}

// A daemon whose disk is full must live on.
TEST_F(BrokenReportStoreTest, ItsHeartbeatBeatsWithEachTryThatFailsAndRestsInBetween) {
  open();
  std::uint64_t before = store_->heartbeat()->read().beats;
  for (int round = 0; round < 3; ++round) {
    recordNumbered(1);
    EXPECT_FALSE(flush());
    waitForRest(*store_);
    const std::uint64_t after = store_->heartbeat()->read().beats;
    EXPECT_GT(after, before);
    before = after;
  }
}

TEST_F(ReportStoreTest, ALongStatementBeatsAsItGoesOn) {
  const auto heartbeat = std::make_shared<Heartbeat>();
  const Heartbeat::OnThisThread scope(heartbeat);
  SqliteDatabase database;
  ASSERT_TRUE(database.open(temporary_.path("long.db"), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  const std::uint64_t before = heartbeat->read().beats;
  EXPECT_TRUE(
      database.run("WITH RECURSIVE n(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM n LIMIT 100000) "
                   "SELECT sum(x) FROM n"));
  EXPECT_GE(heartbeat->read().beats, before + 3);
}

}  // namespace
}  // namespace tonewerk
