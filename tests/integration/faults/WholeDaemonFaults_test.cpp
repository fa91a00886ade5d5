// SPDX-License-Identifier: Apache-2.0
//
// A daemon with its journal, its store and its JSON files in one directory, in which one system call fails:
// each one in turn, with each kind of failure. Then the daemon is killed. The next one has to report what was
// answered, and nothing twice.
#include <algorithm>
#include <chrono>
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <iostream>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "integration/faults/FaultedDaemon.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/store/RowsOf.h"
#include "protocol/AudioEvent.h"
#include "support/FailingCall.h"
#include "support/InterceptedCalls.h"
#include "support/TemporaryDirectory.h"
#include "system/memory/Sanitizers.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

constexpr double kBegin = 1'763'633'880.0;
constexpr std::uint32_t kAlice = 1001;
constexpr std::uint32_t kBob = 1002;
constexpr std::uint32_t kCarol = 1003;
constexpr AudioServiceType kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;

// What must be reported.
struct Promises {
  std::set<int> messages;  // by their numbers
  std::set<ReporterID> played;
  std::map<ReporterID, std::set<int>> filed;

  void take(Promises& others) {
    messages.merge(others.messages);
    played.merge(others.played);
    for (auto& [session, numbers] : others.filed) filed[session].merge(numbers);
    others = {};
  }
};

// What clients ask of a daemon. What was answered is promised as soon as the journal could write it.
class Story {
 public:
  Story(FaultedDaemon& daemon, Promises& promises, int firstNumber)
      : daemon_(daemon), promises_(promises), number_(firstNumber) {}

  void play(MemoryClient& client, ReporterID session) {
    begin(client, session, kLongFormAudio);
    const double begun = daemon_.now();
    say(client, session, kTypeStart, begun,
        {{"session_output_running", true}, {"QMSessionVolume", 0.25}, {"active_devices", "Speaker"}});
    say(client, session, kTypeGeneric, begun + 10, {{"QMSessionVolume", 0.75}});
    if (say(client, session, kTypeStop, begun + 60, {{"session_output_running", false}})) {
      answered_.played.insert(session);
    }
    count(client, session, 2);
  }
  // A session that becomes a file.
  void file(MemoryClient& client, ReporterID session) {
    begin(client, session, kServiceTest);
    answered_.filed[session] = count(client, session, 2);
  }
  void stop(MemoryClient& client, ReporterID session) { ask(client, "stopReportingSessionForID", {session}); }
  void destroy(MemoryClient& client, ReporterID session) {
    ask(client, "destroyReportingSession", {session});
  }
  // Without a session.
  void single(MemoryClient& client) {
    send(client, kCategoryGeneric, kTypeGeneric, numbered(), std::nullopt);
  }
  // Messages with numbers and so many bytes.
  std::set<int> count(MemoryClient& client, ReporterID session, int messages, std::size_t bytes = 0) {
    std::set<int> numbers;
    for (int at = 0; at < messages; ++at) {
      ValueMap message = numbered();
      if (bytes > 0) message.set("text", std::string(bytes, 'x'));
      const int number = number_;
      if (send(client, kCategoryGeneric, kTypeGeneric, message, Value(ValueArray{session}))) {
        numbers.insert(number);
      }
    }
    return numbers;
  }

  // A failure that is over does no more harm.
  void confirm() {
    for (int tries = 0; tries < kTries; ++tries) {
      if (!daemon_.write()) continue;
      promises_.take(answered_);
      return;
    }
  }
  void flush() {
    for (int tries = 0; tries < kTries && !daemon_.flush(); ++tries) {
    }
  }
  // The journal is synced, and what is reported is dropped.
  void pass(int seconds) {
    for (int at = 0; at < seconds; ++at) daemon_.advance(1.0);
    confirm();
  }

 private:
  static constexpr int kTries = 3;

  ValueMap numbered() { return {{"number", ++number_}}; }

  bool ask(MemoryClient& client, std::string_view method, Arguments arguments) {
    const std::uint32_t request = client.request(method, std::move(arguments));
    daemon_.run();
    const auto answer = client.responseTo(request);
    EXPECT_TRUE(answer && !answer->error) << method << " is not done";
    return answer && !answer->error;
  }
  bool send(MemoryClient& client, AudioEventCategory category, AudioEventType type, const ValueMap& message,
            const Argument& sessions) {
    const bool isAnswered = ask(client, "sendMessage", {message, category, type, sessions});
    if (isAnswered && message.contains("number")) answered_.messages.insert(number_);
    confirm();
    return isAnswered;
  }
  bool say(MemoryClient& client, ReporterID session, AudioEventType type, double at, ValueMap message) {
    message.set("twreporting_timestamp", at);
    return send(client, kPlayback, type, message, Value(ValueArray{session}));
  }
  void begin(MemoryClient& client, ReporterID session, AudioServiceType service) {
    ask(client, "createReportingSession", {session});
    ask(client, "setServiceType", {service, session});
    ask(client, "setConfiguration",
        {ValueMap{{"HostApplicationDisplayID", "fault." + std::to_string(session)}}, session});
    client.request("startReportingSessionForID", {session});
    daemon_.run();
  }

  FaultedDaemon& daemon_;
  Promises& promises_;
  Promises answered_;  // and not promised
  int number_;
};

// Sessions that stop, single messages that end, and segments that are dropped; and then sessions that are
// open.
void tellFirst(FaultedDaemon& daemon, Promises& promises) {
  Story story(daemon, promises, 1000);
  const auto alice = daemon.connect(kAlice);
  const auto bob = daemon.connect(kBob);
  const auto carol = daemon.connect(kCarol);
  auto leaving = daemon.connect(kAlice);
  story.single(*carol);
  story.play(*alice, 77);
  story.file(*bob, 80);
  story.stop(*bob, 80);
  story.flush();
  story.destroy(*alice, 77);
  story.destroy(*bob, 80);
  story.pass(7);
  story.play(*alice, 78);
  story.count(*alice, 78, 8, 1000);
  story.stop(*alice, 78);
  story.destroy(*alice, 78);
  story.flush();
  story.pass(16);
  story.play(*alice, 79);
  story.file(*bob, 81);
  story.single(*carol);
  story.flush();
  story.play(*leaving, 76);
  leaving.reset();
  daemon.run();
  story.count(*alice, 79, 2);
  story.confirm();
}

// What comes after a recovery, with other sessions.
void tellNext(FaultedDaemon& daemon, Promises& promises) {
  Story story(daemon, promises, 2000);
  const auto alice = daemon.connect(kAlice);
  const auto bob = daemon.connect(kBob);
  story.play(*alice, 87);
  story.file(*bob, 90);
  story.flush();
  story.stop(*alice, 87);
  story.pass(6);
  story.play(*alice, 88);
  story.confirm();
}

struct Failure {
  const char* name;
  Fault fault;
  int calls;  // that fail, one after the other
};

class WholeDaemonFaults : public testing::TestWithParam<Failure> {
 protected:
  using Tell = void (*)(FaultedDaemon& daemon, Promises& promises);

  // The daemon's directory, as a kill leaves it, and what has been promised.
  struct Crash {
    Promises promises;
    std::vector<std::string> errors;  // that the daemon has logged

    bool hasLogged(std::string_view text) const {
      return std::any_of(errors.begin(), errors.end(),
                         [text](const std::string& line) { return line.find(text) != std::string::npos; });
    }
  };

  static std::vector<long> calls() {
    std::vector<long> all = FailingCall::writingCalls();
    all.insert(all.end(), {SYS_pwrite64, SYS_ftruncate, SYS_unlink, SYS_unlinkat});
    return all;
  }

  // Runs a daemon in `directory` and kills it: `left` then has the files as they were.
  static void crash(const std::string& directory, double now, Tell tell, const std::string& left,
                    Crash& crash, FailingCall* failing = nullptr) {
    FaultedDaemon daemon(directory, now);
    tell(daemon, crash.promises);
    if (failing != nullptr) failing->disarm();
    fs::copy(directory, left, fs::copy_options::recursive);
    crash.errors = daemon.errors();
  }
  // The same with a call that fails. False where that is not possible.
  static bool crashWith(FailingCall& failing, const std::string& directory, double now, Tell tell,
                        const std::string& left, Crash& result) {
    const auto answer = [&failing](const seccomp_data& call) -> std::optional<std::int64_t> {
      const auto answered = failing(call);
      const bool isSync = call.nr == SYS_fsync || call.nr == SYS_fdatasync;
      return isSync && !answered ? 0 : answered;  // no test takes the power away
    };
    return runAnswered(calls(), answer, [&] { crash(directory, now, tell, left, result, &failing); });
  }

  // A daemon for which everything works recovers, ends in order, and has reported what was promised.
  static void expectKept(const std::string& directory, double now, const Promises& promises,
                         bool mayLackFiles) {
    const auto recover = [&] {
      FaultedDaemon next(directory, now);
      next.endInOrder();
      EXPECT_THAT(next.errors(), testing::IsEmpty());
    };
    const auto done = [](const seccomp_data&) { return std::optional<std::int64_t>(0); };
    ASSERT_TRUE(runAnswered({SYS_fsync, SYS_fdatasync}, done, recover));
    SqliteDatabase file;
    ASSERT_TRUE(file.open(directory + "/state/reports.db", SqliteDatabase::Mode::kReadWrite,
                          std::chrono::seconds(30)));
    EXPECT_THAT(rowsOf(file, "PRAGMA integrity_check"), testing::ElementsAre("ok"));
    const std::vector<std::string> rows =
        rowsOf(file,
               "SELECT number || ' ' || max(copies) FROM (SELECT payload ->> 'number' AS number,"
               " count(*) AS copies FROM analytics_event WHERE number IS NOT NULL"
               " GROUP BY number, name) GROUP BY number");
    for (const int number : promises.messages) {
      EXPECT_THAT(rows, testing::Contains(std::to_string(number) + " 1")) << "message " << number;
    }
    for (const std::string& row : rows) EXPECT_TRUE(row.ends_with(" 1")) << row;
    const std::vector<std::string> summaries =
        rowsOf(file,
               "SELECT (payload ->> 'HostApplicationDisplayID') || ' ' || count(*) FROM analytics_event"
               " WHERE name = 'com.orvane.longformaudio.Volume.Summary'"
               " GROUP BY payload ->> 'HostApplicationDisplayID'");
    for (const ReporterID session : promises.played) {
      EXPECT_THAT(summaries, testing::Contains("fault." + std::to_string(session) + " 2"));
    }
    for (const std::string& row : summaries) EXPECT_TRUE(row.ends_with(" 2") || row.ends_with(" 1")) << row;
    expectFiles(directory + "/logs", promises, mayLackFiles);
  }
  static void expectFiles(const std::string& directory, const Promises& promises, bool mayLackFiles) {
    std::multiset<int> found;
    for (const auto& entry : fs::recursive_directory_iterator(directory)) {
      if (!entry.is_regular_file()) continue;
      EXPECT_EQ(entry.path().extension(), ".json");
      std::string text;
      EXPECT_FALSE(readTextFile(entry.path(), text));
      const auto messages = nlohmann::json::parse(text, nullptr, false);
      EXPECT_TRUE(messages.is_array()) << entry.path() << " is not whole";
      for (const auto& message : messages) {
        if (message.begin()->contains("number")) found.insert(message.begin()->at("number").get<int>());
      }
    }
    for (const auto& [session, numbers] : promises.filed) {
      for (const int number : numbers) {
        EXPECT_TRUE(mayLackFiles || found.contains(number)) << "message " << number << " of " << session;
      }
    }
    for (const int number : found) EXPECT_EQ(found.count(number), 1U) << "message " << number;
  }

  static bool hasOldSegment(const std::string& directory) {
    const fs::directory_iterator files(directory + "/state/journal");
    return std::any_of(begin(files), end(files),
                       [](const fs::directory_entry& file) { return file.path().extension() == ".old"; });
  }

  static constexpr int kMostCalls = 2'000;
  // With a sanitizer all calls would take minutes.
  static constexpr int kStep = kHasSanitizer ? 7 : 1;
};

std::string nameOf(const testing::TestParamInfo<Failure>& info) { return info.param.name; }

INSTANTIATE_TEST_SUITE_P(Faults, WholeDaemonFaults,
                         testing::Values(Failure{"NoSpace", Fault::kNoSpace, 1},
                                         Failure{"Broken", Fault::kBroken, 1},
                                         Failure{"Short", Fault::kShort, 1},
                                         Failure{"ShortAndFullForAWhile", Fault::kShort, 6}),
                         nameOf);

TEST_P(WholeDaemonFaults, WhicheverCallFailsWhatWasAnsweredIsReportedOnceAfterAKill) {
  int nth = 1;
  for (bool isOver = false; !isOver && !HasFailure(); nth += kStep) {
    ASSERT_LT(nth, kMostCalls);
    SCOPED_TRACE("call " + std::to_string(nth));
    const TemporaryDirectory directory;
    FailingCall failing(nth, GetParam().fault, GetParam().calls);
    Crash crash;
    if (!crashWith(failing, directory.path("first"), kBegin, tellFirst, directory.path("next"), crash)) {
      GTEST_SKIP() << "system calls cannot be intercepted here";
    }
    EXPECT_EQ(crash.promises.played.size(), 4U);
    // A file that could not be written is given up, which the log says.
    const bool lacksFiles = crash.hasLogged("SummaryJsonFileWorker failed");
    expectKept(directory.path("next"), kBegin + 600, crash.promises, lacksFiles);
    if (HasFailure()) {
      for (const std::string& error : crash.errors) std::cout << "logged: " << error << "\n";
    }
    isOver = !failing.wasReached();
  }
  EXPECT_GT(nth, 200);
  RecordProperty("calls", nth);
}

TEST_P(WholeDaemonFaults, WhicheverCallFailsInARecoveryAnotherOneReportsWhatWasAnswered) {
  const TemporaryDirectory base;
  Crash first;
  crash(base.path("first"), kBegin, tellFirst, base.path("crashed"), first);
  ASSERT_EQ(first.promises.played.size(), 4U);
  ASSERT_TRUE(hasOldSegment(base.path("crashed"))) << "no segment was dropped";
  int nth = 1;
  for (bool isOver = false; !isOver && !HasFailure(); nth += kStep) {
    ASSERT_LT(nth, kMostCalls);
    SCOPED_TRACE("call " + std::to_string(nth));
    const TemporaryDirectory directory;
    fs::copy(base.path("crashed"), directory.path("second"), fs::copy_options::recursive);
    FailingCall failing(nth, GetParam().fault, GetParam().calls);
    Crash second;
    if (!crashWith(failing, directory.path("second"), kBegin + 600, tellNext, directory.path("third"),
                   second)) {
      GTEST_SKIP() << "system calls cannot be intercepted here";
    }
    Promises promises = first.promises;
    promises.take(second.promises);
    const bool lacksFiles = second.hasLogged("SummaryJsonFileWorker failed");
    expectKept(directory.path("third"), kBegin + 1200, promises, lacksFiles);
    if (HasFailure()) {
      for (const std::string& error : second.errors) std::cout << "logged: " << error << "\n";
    }
    isOver = !failing.wasReached();
  }
  EXPECT_GT(nth, 100);
  RecordProperty("calls", nth);
}

}  // namespace
}  // namespace tonewerk
