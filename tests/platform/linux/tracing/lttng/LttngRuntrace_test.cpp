// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/LttngRuntrace.h"

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <gmock/gmock.h>
#include <thread>

#include "platform/Kolvi.h"
#include "platform/linux/tracing/lttng/CallLimit.h"
#include "platform/linux/tracing/lttng/LttngTrace.h"
#include "platform/linux/tracing/lttng/TracingRig.h"
#include "support/manual/ManualTimers.h"
#include "tonewerk/signpost.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr char kProbes[] = R"([{"name": "decode", "type": "interval"}, {"name": "mix", "type": "interval"}])";

std::uint64_t nanosecondsNow() {
  return static_cast<std::uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
}

double secondsNow() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

class LttngRuntraceTest : public testing::Test {
 protected:
  // Starts a trace. The test fails if that fails.
  std::shared_ptr<RuntraceSession> startWell(const std::string& probes = kProbes) {
    auto session = rig_.start(listener_, probes);
    EXPECT_TRUE(listener_->waitForStart());
    EXPECT_EQ(listener_->startError, std::nullopt);
    EXPECT_TRUE(session->isValid());
    return session;
  }

  // Stops the trace and reads the probes' events.
  std::vector<KolviProbe> finish(RuntraceSession& session, const std::string& probes = kProbes) {
    session.stopRuntrace();
    EXPECT_TRUE(listener_->waitForCompletion());
    EXPECT_EQ(listener_->stopError, std::nullopt);
    EXPECT_EQ(listener_->completionError, std::nullopt);
    EXPECT_FALSE(session.isValid());
    return read(probes);
  }

  std::vector<KolviProbe> read(const std::string& probes) {
    problem_.clear();
    const auto model = rig_.kolvi.openModel(listener_->location, problem_);
    EXPECT_EQ(problem_, "");
    if (model == nullptr) return {};
    return model->makeProbes(*probeDictionariesOf(*rig_.json.parse(probes, problem_)));
  }

  // The problem of an attempt to start; empty if it succeeds.
  std::string startProblem(const std::string& probeListPath) {
    const auto session = rig_.runtrace->makeSession({.probeListPath = probeListPath});
    session->setDelegate(listener_);
    session->startRuntrace();
    EXPECT_TRUE(listener_->waitForStart());
    EXPECT_EQ(session->isValid(), !listener_->startError.has_value());
    return listener_->startError.value_or("");
  }

  TracingRig rig_;
  std::shared_ptr<TraceListener> listener_ = std::make_shared<TraceListener>();
  std::string problem_;
};

TEST_F(LttngRuntraceTest, RecordsWhenIntervalsBegan) {
  const auto session = startWell();
  const double before = secondsNow();
  for (std::uint64_t i = 0; i < 10; ++i) {
    signpost::begin("decode", i);
    signpost::end("decode", i);
  }
  const double after = secondsNow();
  const auto probes = finish(*session);
  ASSERT_THAT(probes, SizeIs(2));
  ASSERT_THAT(probes[0].events, SizeIs(10));
  // The tracer compares its clock with the time of day only once, and does not read both at the same instant.
  constexpr double kClockError = 0.1;
  double last = before - kClockError;
  for (const KolviEvent& event : probes[0].events) {
    ASSERT_TRUE(event.beginTime);
    EXPECT_GE(*event.beginTime, last);
    last = *event.beginTime;
  }
  EXPECT_LE(last, after + kClockError);
}

TEST_F(LttngRuntraceTest, RecordsHowLongIntervalsTook) {
  const auto session = startWell();
  std::vector<std::uint64_t> most;   // from before the begin to after the end
  std::vector<std::uint64_t> least;  // from after the begin to before the end
  for (std::uint64_t i = 0; i < 100; ++i) {
    const std::uint64_t before = nanosecondsNow();
    signpost::begin("decode", i);
    const std::uint64_t begun = nanosecondsNow();
    while (nanosecondsNow() < begun + i * 1000) {
    }
    const std::uint64_t ending = nanosecondsNow();
    signpost::end("decode", i);
    most.push_back(nanosecondsNow() - before);
    least.push_back(ending - begun);
  }
  const auto probes = finish(*session);
  ASSERT_THAT(probes, SizeIs(2));
  ASSERT_THAT(probes[0].events, SizeIs(100));
  EXPECT_THAT(probes[1].events, IsEmpty());
  for (std::size_t i = 0; i < 100; ++i) {
    EXPECT_GE(probes[0].events[i].timeDuration, least[i]);
    EXPECT_LE(probes[0].events[i].timeDuration, most[i]);
  }
}

TEST_F(LttngRuntraceTest, KeepsThreadsApartAndLeavesOutIncompleteIntervals) {
  signpost::begin("decode", 1);
  const auto session = startWell();
  signpost::end("decode", 1);
  const auto passMany = [] {
    for (int i = 0; i < 500; ++i) {
      const signpost::Interval outer("mix");
      const signpost::Interval inner("decode");
    }
  };
  std::thread first(passMany);
  std::thread second(passMany);
  first.join();
  second.join();
  signpost::begin("mix", 2);
  const auto probes = finish(*session);
  signpost::end("mix", 2);
  ASSERT_THAT(probes, SizeIs(2));
  EXPECT_THAT(probes[0].events, SizeIs(1000));
  EXPECT_THAT(probes[1].events, SizeIs(1000));
}

TEST_F(LttngRuntraceTest, TracesOnlyWhatTheListNames) {
  const std::string probes =
      R"([{"name": "de*", "type": "interval"}, {"name": "a 'b' \\ c", "type": "interval"},
                                 {"name": "x", "type": "interval", "signpost": "grün"}])";
  const auto session = startWell(probes);
  for (const char* name : {"decode", "de*", "a 'b' \\ c", "grün", "x", "other"}) {
    const signpost::Interval interval(name);
  }
  const auto found = finish(*session, probes);
  ASSERT_THAT(found, SizeIs(3));
  for (const KolviProbe& probe : found) EXPECT_THAT(probe.events, SizeIs(1)) << probe.name;
  // The trace contains no other signposts.
  const auto all = read(R"([{"name": "decode", "type": "interval"}, {"name": "x", "type": "interval"},
                            {"name": "other", "type": "interval"}])");
  for (const KolviProbe& probe : all) EXPECT_THAT(probe.events, IsEmpty()) << probe.name;
}

TEST_F(LttngRuntraceTest, AcceptsTheLongestList) {
  std::string probes = "[";
  for (int i = 0; i < 200; ++i) {
    const std::string name = std::to_string(i) + std::string(197, '*');
    probes += (i == 0 ? "" : ",") + (R"({"type": "interval", "name": ")" + name + "\"}");
  }
  probes += "]";
  const auto session = startWell(probes);
  const std::string last = "199" + std::string(197, '*');
  { const signpost::Interval interval(last.c_str()); }
  EXPECT_THAT(finish(*session, probes).back().events, SizeIs(1));
}

TEST_F(LttngRuntraceTest, ATraceWithoutAnyOfTheSignpostsIsATrace) {
  const auto session = startWell();
  for (const KolviProbe& probe : finish(*session)) EXPECT_THAT(probe.events, IsEmpty());
}

TEST_F(LttngRuntraceTest, OneTraceAfterTheOtherEachHasItsOwn) {
  for (std::size_t count = 1; count <= 3; ++count) {
    listener_ = std::make_shared<TraceListener>();
    const auto session = startWell();
    for (std::size_t i = 0; i < count; ++i) {
      const signpost::Interval interval("decode");
    }
    EXPECT_THAT(finish(*session).at(0).events, SizeIs(count));
  }
}

TEST_F(LttngRuntraceTest, TheTraceIsRemovedWithItsToken) {
  const auto session = startWell();
  finish(*session);
  rig_.runtrace.reset();  // its thread may have used the directory until now
  EXPECT_TRUE(fs::exists(listener_->location));
  listener_->token.reset();
  EXPECT_FALSE(fs::exists(listener_->location));
}

TEST_F(LttngRuntraceTest, AnAbandonedSessionLeavesNothing) {
  auto session = startWell();
  session.reset();
  listener_ = std::make_shared<TraceListener>();
  session = startWell();  // after the other one has ended
  session->stopRuntrace();
  EXPECT_TRUE(listener_->waitForCompletion());
  listener_->token.reset();
  rig_.runtrace.reset();  // its thread may have used the directory until now
  for (const auto& entry : fs::directory_iterator(rig_.directory.path("traces"))) {
    EXPECT_FALSE(entry.is_directory()) << entry.path();
  }
}

TEST_F(LttngRuntraceTest, ASessionThatIsAbandonedWhileItStopsStillCompletes) {
  auto session = startWell();
  session->stopRuntrace();
  session.reset();
  EXPECT_TRUE(listener_->waitForCompletion());
  EXPECT_EQ(listener_->completionError, std::nullopt);
}

TEST_F(LttngRuntraceTest, AStopWithoutAStartDoesNothing) {
  const auto session = rig_.runtrace->makeSession({.probeListPath = "/nowhere"});
  session->setDelegate(listener_);
  session->stopRuntrace();
  session->startRuntrace();
  EXPECT_TRUE(listener_->waitForStart());
  EXPECT_EQ(listener_->location, "");
  EXPECT_EQ(listener_->stopError, std::nullopt);
}

TEST_F(LttngRuntraceTest, ARemovedDelegateIsNotCalled) {
  const auto session = startWell();
  session->setDelegate({});
  session->stopRuntrace();
  const auto other = std::make_shared<TraceListener>();
  const auto next = rig_.start(other, kProbes);  // queued after the stop
  EXPECT_TRUE(other->waitForStart());
  EXPECT_EQ(listener_->location, "");
}

// Failures of a start.

TEST_F(LttngRuntraceTest, AStartSaysWhatIsWrongWithTheProbeList) {
  EXPECT_THAT(startProblem("/nowhere/probes.json"),
              StartsWith("the probe list /nowhere/probes.json cannot be read: "));
}

TEST_F(LttngRuntraceTest, AStartSaysThatThereIsNoSessionDaemon) {
  const std::string path = std::getenv("PATH");
  ::setenv("PATH", rig_.directory.path().c_str(), 1);
  const std::string problem = startProblem(rig_.writeProbes(kProbes));
  ::setenv("PATH", path.c_str(), 1);
  if (problem.empty()) GTEST_SKIP() << "a session daemon runs already";
  EXPECT_EQ(problem, "lttng-sessiond cannot be started: " +
                         std::make_error_code(std::errc::no_such_file_or_directory).message());
}

TEST_F(LttngRuntraceTest, AStartSaysWhatTheSessionDaemonEndedWith) {
  const std::string path = std::getenv("PATH");
  const std::string program = rig_.directory.path("lttng-sessiond");
  std::ofstream(program)
      << "#!/bin/sh\necho 'first line' >&2\necho 'Error: somebody else has it' >&2\nexit 1\n";
  fs::permissions(program, fs::perms::owner_all);
  ::setenv("PATH", (rig_.directory.path() + ":" + path).c_str(), 1);
  const std::string problem = startProblem(rig_.writeProbes(kProbes));
  ::setenv("PATH", path.c_str(), 1);
  if (problem.empty()) GTEST_SKIP() << "a session daemon runs already";
  EXPECT_EQ(problem, "lttng-sessiond ended at once: Error: somebody else has it");
}

// Failures of a running trace.

TEST_F(LttngRuntraceTest, ATraceWithLostEventsIsRefused) {
  const auto session = startWell();
  const pid_t daemon = TracingRig::sessionDaemon();
  if (daemon == 0) GTEST_SKIP() << "the session daemon is somebody else's";
  const pid_t writer = TracingRig::writerOf(daemon);
  ASSERT_GT(writer, 0);
  ::kill(writer, SIGSTOP);  // so that the buffers are not read
  for (int i = 0; i < 400'000; ++i) {
    const signpost::Interval interval("decode");
  }
  ::kill(writer, SIGCONT);
  session->stopRuntrace();
  ASSERT_TRUE(listener_->waitForCompletion());
  ASSERT_TRUE(listener_->completionError.has_value());
  EXPECT_THAT(*listener_->completionError, StartsWith("the trace has lost "));
  EXPECT_EQ(listener_->location, "");
  EXPECT_EQ(listener_->token, nullptr);
}

TEST_F(LttngRuntraceTest, ASessionDaemonThatDiesIsAnErrorAndTheNextTraceHasAnother) {
  const auto session = startWell();
  const pid_t daemon = TracingRig::sessionDaemon();
  if (daemon == 0) GTEST_SKIP() << "the session daemon is somebody else's";
  ::kill(daemon, SIGKILL);
  session->stopRuntrace();
  ASSERT_TRUE(listener_->waitForCompletion());
  EXPECT_TRUE(listener_->completionError.has_value());

  listener_ = std::make_shared<TraceListener>();
  const auto next = startWell();
  { const signpost::Interval interval("decode"); }
  EXPECT_THAT(finish(*next).at(0).events, SizeIs(1));
}

TEST_F(LttngRuntraceTest, AWriterThatDiesIsAnErrorAndTheNextTraceHasAnother) {
  const auto session = startWell();
  const pid_t daemon = TracingRig::sessionDaemon();
  if (daemon == 0) GTEST_SKIP() << "the session daemon is somebody else's";
  ::kill(TracingRig::writerOf(daemon), SIGKILL);
  session->stopRuntrace();
  ASSERT_TRUE(listener_->waitForCompletion());
  EXPECT_TRUE(listener_->completionError.has_value());

  listener_ = std::make_shared<TraceListener>();
  const auto next = startWell();
  { const signpost::Interval interval("decode"); }
  EXPECT_THAT(finish(*next).at(0).events, SizeIs(1));
}

TEST_F(LttngRuntraceTest, EndsThePrivateSessionDaemonWithItself) {
  const auto session = startWell();
  const pid_t daemon = TracingRig::sessionDaemon();
  if (daemon == 0) GTEST_SKIP() << "the session daemon is somebody else's";
  rig_.runtrace.reset();
  EXPECT_EQ(TracingRig::sessionDaemon(), 0);
  EXPECT_EQ(::kill(daemon, 0), -1);
}

// The time limit uses a timer of the test, so that the test does not have to wait.
TEST(LttngRuntraceTimesTest, AFrozenSessionDaemonIsKilledAndTheCallFails) {
  ManualClock clock;
  ManualTimers timers(clock);
  TracingRig rig(&timers);
  const auto listener = std::make_shared<TraceListener>();
  const auto session = rig.start(listener, kProbes);
  ASSERT_TRUE(listener->waitForStart());
  ASSERT_EQ(listener->startError, std::nullopt);
  const pid_t daemon = TracingRig::sessionDaemon();
  if (daemon == 0) GTEST_SKIP() << "the session daemon is somebody else's";
  ::kill(daemon, SIGSTOP);
  session->stopRuntrace();
  while (timers.count() == 0) std::this_thread::yield();
  clock.advance(CallLimit::kTimeout);
  ASSERT_TRUE(listener->waitForCompletion());
  EXPECT_TRUE(listener->completionError.has_value());
}

TEST(FiltersForTest, MatchesNamesAndNoPatterns) {
  EXPECT_THAT(filtersFor({"decode", "mix"}), ElementsAre(R"(name == "decode" || name == "mix")"));
  EXPECT_THAT(filtersFor({R"(a*\)"}), ElementsAre(R"(name == "a\*\\")"));
  EXPECT_THAT(filtersFor({}), IsEmpty());
}

TEST(FiltersForTest, MakesSeveralOfManyNames) {
  std::set<std::string> names;
  for (int i = 0; i < 200; ++i) names.insert(std::to_string(i) + std::string(197, '*'));
  const auto filters = filtersFor(names);
  EXPECT_GT(filters.size(), 1U);
  std::size_t conditions = 0;
  for (const std::string& filter : filters) {
    EXPECT_LE(filter.size(), 10'000U);
    for (std::size_t at = 0; (at = filter.find("name == ", at)) != std::string::npos; ++at) ++conditions;
  }
  EXPECT_EQ(conditions, 200U);
}

// Reading a trace.

TEST_F(LttngRuntraceTest, ADamagedTraceIsRefusedInTime) {
  const auto session = startWell();
  for (int i = 0; i < 1000; ++i) {
    const signpost::Interval interval("decode");
  }
  finish(*session);
  std::string metadata;
  for (const auto& entry : fs::recursive_directory_iterator(listener_->location)) {
    if (entry.path().filename() == "metadata") metadata = entry.path();
  }
  ASSERT_NE(metadata, "");
  TraceReaderKolvi impatient(TONEWERK_TRACE_READER_PATH, std::chrono::seconds(3));
  const std::uintmax_t size = fs::file_size(metadata);
  for (const std::uintmax_t part : {size / 2, size / 4, std::uintmax_t{0}}) {
    fs::resize_file(metadata, part);
    problem_.clear();
    EXPECT_EQ(impatient.openModel(listener_->location, problem_), nullptr) << part;
    EXPECT_NE(problem_, "") << part;
  }
}

TEST_F(LttngRuntraceTest, ATraceWithoutItsStreamsIsRefused) {
  const auto session = startWell();
  finish(*session);
  for (const auto& entry : fs::recursive_directory_iterator(listener_->location)) {
    if (entry.is_regular_file() && entry.path().filename() != "metadata") fs::remove(entry.path());
  }
  EXPECT_EQ(rig_.kolvi.openModel(listener_->location, problem_), nullptr);
  EXPECT_NE(problem_, "");
}

class TraceReaderKolviTest : public testing::Test {
 protected:
  // Opens a trace with a reader that is this shell script.
  std::string problemWith(const std::string& script) {
    const std::string reader = directory_.path("reader");
    std::ofstream(reader) << "#!/bin/sh\n" << script << "\n";
    fs::permissions(reader, fs::perms::owner_all);
    TraceReaderKolvi kolvi(reader, std::chrono::milliseconds(500));
    std::string problem;
    EXPECT_EQ(kolvi.openModel(directory_.path(), problem), nullptr);
    return problem;
  }

  TemporaryDirectory directory_;
};

TEST_F(TraceReaderKolviTest, AReaderThatHangsIsEnded) {
  EXPECT_THAT(problemWith("while :; do sleep 1; done"), StartsWith("tw-trace-reader: "));
}

TEST_F(TraceReaderKolviTest, AReaderThatDiesIsAnError) {
  EXPECT_THAT(problemWith("echo 'name decode'; kill -ABRT $$"), StartsWith("tw-trace-reader: "));
}

TEST_F(TraceReaderKolviTest, AReaderThatIsMissingIsAnError) {
  TraceReaderKolvi kolvi("/nowhere/reader");
  std::string problem;
  EXPECT_EQ(kolvi.openModel("/nowhere", problem), nullptr);
  EXPECT_THAT(problem, StartsWith("tw-trace-reader: "));
}

TEST_F(TraceReaderKolviTest, InvalidOutputOfTheReaderIsAnError) {
  EXPECT_EQ(problemWith("echo nonsense"), "the trace reader's answer is not whole");
}

TEST_F(TraceReaderKolviTest, ATraceMustHoldItsBeginningAndItsEnd) {
  const std::string check = "echo 'name com.orvane.tonewerk.check'; echo '0 1 2'; ";
  EXPECT_EQ(problemWith("echo 'name decode'; echo '0 1 2'; echo '0 1 2'; echo end"),
            "the trace lacks its beginning or its end");
  EXPECT_EQ(problemWith(check + "echo end"), "the trace lacks its beginning or its end");
}

TEST_F(TraceReaderKolviTest, TheRealReaderSaysWhatIsWrong) {
  TraceReaderKolvi kolvi(TONEWERK_TRACE_READER_PATH);
  std::string problem;
  EXPECT_EQ(kolvi.openModel(directory_.path(), problem), nullptr);
  EXPECT_EQ(problem, "the trace holds no events");
}

}  // namespace
}  // namespace tonewerk
