// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/GlitchReports.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "bridges/pipewire/drivers/LeavingStreams.h"
#include "support/manual/ManualEventLoop.h"
#include "support/memory/MemoryGlitchFacts.h"
#include "support/memory/MemorySessionSink.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

// Two players: the first plays through a filter, the second to the speaker itself.
class GlitchReportsTest : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kSpeaker = 36;
  static constexpr std::uint32_t kFirst = 42;
  static constexpr std::uint32_t kSecond = 43;
  static constexpr std::uint32_t kFilter = 44;
  static constexpr nanoseconds kPeriod = milliseconds(20);

  void SetUp() override {
    model.complete();
    addNode(kSpeaker, "speaker", "Audio/Sink", 0);
    model.nodeDescribed(kSpeaker, true, {{std::string(kNodeDriverKey), "true"}});
    addNode(kFirst, "first", "Stream/Output/Audio", 1001);
    addNode(kSecond, "second", "Stream/Output/Audio", 1002);
    addNode(kFilter, "filter", "Audio/Filter", 1003);
    for (const std::uint32_t stream : {kFirst, kSecond}) model.nodeDescribed(stream, true, {});
    model.linkAppeared(201, kFirst, kFilter);
    model.linkAppeared(202, kFilter, kSpeaker);
    model.linkAppeared(203, kSecond, kSpeaker);
    clock.advance(60.0);
    ASSERT_THAT(sink.sessions, SizeIs(2));
    run(3);
    report();
  }
  void addNode(std::uint32_t node, const std::string& name, const char* mediaClass, int process) {
    const std::string client = std::to_string(node + 1000);
    if (process != 0) {
      model.clientDescribed(node + 1000, {{std::string(kApplicationNameKey), name + "-app"},
                                          {std::string(kSocketProcessKey), std::to_string(process)}});
    }
    Properties properties{{std::string(kMediaClassKey), mediaClass}, {std::string(kNodeNameKey), name}};
    if (process != 0) properties[std::string(kClientIDKey)] = client;
    model.nodeAppeared(node, properties);
  }

  ProfiledCycle next() {
    ProfiledCycle cycle;
    cycle.driver = kSpeaker;
    cycle.number = number++;
    cycle.position = cycle.number * 960;
    cycle.frames = 960;
    cycle.hertz = 48'000;
    cycle.period = kPeriod;
    cycle.begin = clock.monotonic();
    cycle.processing = milliseconds(1);
    for (const std::uint32_t node : {kFirst, kSecond, kFilter}) {
      cycle.followers.push_back(finished(node, *cycle.begin + microseconds(node == kFilter ? 100 : 10)));
    }
    clock.advance(0.020);
    return cycle;
  }
  static ProfiledFollower finished(std::uint32_t node, nanoseconds signal) {
    return {node,
            true,
            std::nullopt,
            {NodeTimes::kFinished, signal, signal + microseconds(20), signal + microseconds(60)}};
  }
  void run(int count) {
    for (int i = 0; i < count; ++i) cycles.push_back(next());
  }
  // A cycle that these nodes have left unfinished. The first computes, the others wait for it.
  void runLate(std::vector<std::uint32_t> late) {
    ProfiledCycle cycle = next();
    cycle.processing = cycle.period + milliseconds(1);
    for (ProfiledFollower& follower : cycle.followers) {
      if (std::find(late.begin(), late.end(), follower.node) == late.end()) continue;
      const NodeTimes times = follower.times;
      follower.hasFinished = false;
      follower.times = {};
      if (follower.node == late.front()) {
        follower.times = {NodeTimes::kAwake, times.signal, times.awake, std::nullopt};
      }
    }
    cycles.push_back(cycle);
  }
  void report() {
    glitches.profiled(cycles);
    cycles.clear();
  }
  std::vector<ValueMap> overloads(std::size_t session) const {
    std::vector<ValueMap> found;
    for (const MemorySessionSink::Message& message : sink.sessions.at(session).messages) {
      if (message.category == 7 && message.type == 6) found.push_back(message.payload);
    }
    return found;
  }
  ValueMap onlyOverload(std::size_t session) const {
    const std::vector<ValueMap> found = overloads(session);
    EXPECT_THAT(found, SizeIs(1));
    return found.size() == 1 ? found[0] : ValueMap();
  }

  ManualClock clock;
  ManualEventLoop loop{clock};
  MemorySessionSink sink;
  ReporterIdentifiers identifiers{clock, 1};
  StreamReports streams{sink, clock, identifiers, loop};
  LeavingStreams leaving{streams};
  GraphModel model{leaving};
  MemoryGlitchFacts facts;
  GlitchReports glitches{model, streams, facts, clock};
  std::uint64_t number = 1;
  std::vector<ProfiledCycle> cycles;
};

TEST_F(GlitchReportsTest, TellsAStreamThatItsFilterWasLate) {
  facts.names = {{1003, "filterd"}};
  runLate({kFilter});
  run(2);
  report();
  const ValueMap overload = onlyOverload(0);
  EXPECT_EQ(overload.text("issue_type"), "overload");
  EXPECT_EQ(overload.integer("xrun_count"), 1);
  EXPECT_EQ(overload.text("glitch_cause"), "late");
  EXPECT_EQ(overload.text("glitch_first_cause"), "late");
  EXPECT_EQ(overload.text("glitch_culprit_node"), "filter");
  EXPECT_EQ(overload.text("glitch_culprit_application"), "filter-app");
  EXPECT_EQ(overload.text("glitch_culprit_process"), "filterd");
  EXPECT_EQ(overload.integer("glitch_culprit_pid"), 1003);
  EXPECT_EQ(overload.text("glitch_node"), "filter");
  EXPECT_EQ(overload.text("glitch_device"), "speaker");
  EXPECT_EQ(overload.text("glitch_chain"), "first > filter > speaker");
  EXPECT_EQ(overload.number("glitch_period_ms"), 20.0);
  EXPECT_EQ(overload.integer("glitch_quantum"), 960);
  EXPECT_EQ(overload.integer("glitch_rate"), 48'000);
  EXPECT_EQ(overload.number("glitch_lost_ms"), 20.0);
  EXPECT_THAT(overload.text("glitch_id"), HasSubstr("-4"));
  EXPECT_THAT(overload.text("glitch_reason"), HasSubstr("filter took "));
  EXPECT_THAT(overload.text("glitch_cycles"), HasSubstr("\"process\":\"filterd\""));
}

TEST_F(GlitchReportsTest, LeavesOtherStreamsOfTheDeviceAlone) {
  runLate({kFilter});
  run(2);
  report();
  EXPECT_THAT(overloads(1), IsEmpty());
}

// The filter mixes both streams; the one that was in time loses its audio, too.
TEST_F(GlitchReportsTest, GivesAllStreamsOfOneGlitchTheSameCulpritAndTheInnocentOneItsOwnCause) {
  model.removed(203);
  model.linkAppeared(204, kSecond, kFilter);
  run(10);
  runLate({kFirst, kFilter});
  run(2);
  report();
  const ValueMap guilty = onlyOverload(0);
  const ValueMap innocent = onlyOverload(1);
  EXPECT_EQ(guilty.text("glitch_id"), innocent.text("glitch_id"));
  EXPECT_EQ(guilty.text("glitch_culprit_node"), "first");
  EXPECT_EQ(innocent.text("glitch_culprit_node"), "first");
  EXPECT_EQ(innocent.text("glitch_first_cause"), guilty.text("glitch_cause"));
  EXPECT_EQ(innocent.text("glitch_cause"), "waiting for another");
  EXPECT_EQ(innocent.text("glitch_node"), "filter");
  EXPECT_EQ(innocent.text("glitch_chain"), "first > filter > speaker");
}

TEST_F(GlitchReportsTest, TellsAllStreamsOfADeviceThatRanOutOfData) {
  run(1);
  cycles.back().xruns = 1;
  run(2);
  for (std::size_t i = 1; i < 3; ++i) cycles[i].xruns = 1;
  report();
  for (const std::size_t session : {0U, 1U}) {
    const ValueMap overload = onlyOverload(session);
    EXPECT_EQ(overload.text("glitch_cause"), "device");
    EXPECT_FALSE(overload.contains("glitch_culprit_node"));
    EXPECT_FALSE(overload.contains("glitch_culprit_application"));
  }
}

TEST_F(GlitchReportsTest, NamesTheProcessThatHeldTheProcessor) {
  facts.processes[1001] = {.waited = milliseconds(30)};
  facts.machineFacts.holders = {{77, "hog", 90, milliseconds(80)}};
  runLate({kFirst, kFilter});
  run(2);
  report();
  const ValueMap overload = onlyOverload(0);
  EXPECT_EQ(overload.text("glitch_cause"), "not scheduled");
  EXPECT_EQ(overload.text("glitch_culprit_process"), "hog");
  EXPECT_EQ(overload.integer("glitch_culprit_pid"), 77);
  EXPECT_EQ(overload.text("glitch_node"), "first");
}

// The second player computes for 40 us in each cycle of 20 ms: 20 ms in ten seconds.
TEST_F(GlitchReportsTest, DoesNotNameANodeThatRanAsUsualForHoldingTheProcessor) {
  facts.processes[1001] = {.waited = milliseconds(30)};
  facts.machineFacts.interval = std::chrono::seconds(10);
  facts.machineFacts.holders = {{1002, "player", 88, milliseconds(24)}, {77, "hog", 90, milliseconds(15)}};
  runLate({kFirst, kFilter});
  run(2);
  report();
  EXPECT_EQ(onlyOverload(0).integer("glitch_culprit_pid"), 77);
}

// The two nodes of the process compute for 40 us in each cycle of 20 ms: 40 ms in ten seconds.
TEST_F(GlitchReportsTest, KnowsHowLongTheNodesOfAProcessUsuallyRun) {
  model.clientDescribed(kSecond + 1000, {{std::string(kSocketProcessKey), "1001"}});
  facts.processes[1001] = {.ran = milliseconds(45), .interval = std::chrono::seconds(10)};
  runLate({kFirst, kFilter});
  run(2);
  report();
  EXPECT_THAT(onlyOverload(0).text("glitch_reason"), HasSubstr("ran for 45.00 ms and waited for something"));
}

// The report of the profiler ends before it is known how long the node needs.
TEST_F(GlitchReportsTest, JudgesAGlitchThatIsNotOverWithTheNextReport) {
  runLate({kFirst, kFilter});
  report();
  EXPECT_THAT(overloads(0), IsEmpty());
  run(1);
  report();
  EXPECT_THAT(overloads(0), SizeIs(1));
}

TEST_F(GlitchReportsTest, TellsOfAGlitchThatIsNotOverBeforeTheSessionEnds) {
  runLate({kFirst, kFilter});
  report();
  leaving.tell(&glitches);
  model.removed(kFirst);
  leaving.tell(nullptr);
  EXPECT_THAT(overloads(0), SizeIs(1));
  EXPECT_EQ(sink.sessions[0].calls.back(), "destroy");
}

TEST_F(GlitchReportsTest, KnowsLinksThatWereRemovedAfterTheGlitch) {
  runLate({kFilter});
  run(2);
  model.removed(201);
  report();
  EXPECT_THAT(overloads(0), SizeIs(1));
}

TEST_F(GlitchReportsTest, DoesNotCallAStartingStreamLate) {
  addNode(50, "third", "Stream/Output/Audio", 1004);
  model.nodeDescribed(50, true, {});
  model.linkAppeared(205, 50, kSpeaker);
  clock.advance(2.0);
  ProfiledCycle start = next();
  start.processing = start.period + milliseconds(1);
  start.followers.push_back({50, false, std::nullopt, {NodeTimes::kSignalled, start.begin, {}, {}}});
  cycles.push_back(start);
  run(2);
  report();
  for (std::size_t session = 0; session < 3; ++session) EXPECT_THAT(overloads(session), IsEmpty());
}

TEST_F(GlitchReportsTest, JudgesAFewGlitchesOfAReportAndCountsTheOthers) {
  for (int i = 0; i < 20; ++i) {
    runLate({kFilter});
    run(2);
  }
  report();
  clock.advance(1.0);
  std::int64_t xruns = 0;
  for (const ValueMap& overload : overloads(0)) xruns += overload.integer("xrun_count");
  EXPECT_EQ(xruns, 20);
  EXPECT_THAT(overloads(0), SizeIs(2));
}

TEST_F(GlitchReportsTest, KeepsTheCyclesOfAGlitchShort) {
  for (std::uint32_t i = 0; i < 60; ++i) {
    addNode(300 + i, "a node with a rather long name, number " + std::to_string(i), "Audio/Filter", 0);
  }
  for (int i = 0; i < 4; ++i) {
    if (i == 2) {
      runLate({kFilter});
    } else {
      run(1);
    }
    for (std::uint32_t node = 300; node < 360; ++node) {
      cycles.back().followers.push_back(finished(node, *cycles.back().begin + microseconds(5)));
    }
  }
  report();
  const std::string text = onlyOverload(0).text("glitch_cycles");
  EXPECT_LE(text.size(), 6U * 1024);
  EXPECT_THAT(text, HasSubstr("[{\"begin\":0.0,\"period\":20000.0"));
}

TEST_F(GlitchReportsTest, MeasuresTheNodesAndCountsTheirGlitches) {
  runLate({kFilter});
  run(2);
  report();
  std::vector<std::string> texts;
  for (const NodeLoad& load : glitches.loads()) {
    texts.push_back(load.name + " " + std::to_string(load.busyPerMille) + " " +
                    std::to_string(load.glitches) + " " + std::to_string(load.process));
  }
  EXPECT_THAT(texts, ElementsAre("first 2 0 1001", "second 2 0 1002", "filter 2 1 1003"));
}

TEST_F(GlitchReportsTest, AsksTheKernelAboutTheProcessesThatCompute) {
  EXPECT_THAT(facts.audio, ElementsAre(1001, 1002, 1003));
}

// PipeWire's later releases count for each node, and need not show the cycle.
TEST_F(GlitchReportsTest, ReportsAnXrunThatPipeWireCountedWithoutShowingIt) {
  run(1);
  for (ProfiledFollower& follower : cycles.back().followers) follower.xruns = 4;
  run(1);
  for (ProfiledFollower& follower : cycles.back().followers) follower.xruns = follower.node == kFirst ? 6 : 4;
  report();
  EXPECT_EQ(onlyOverload(0).integer("xrun_count"), 2);
  EXPECT_FALSE(onlyOverload(0).contains("glitch_id"));
  EXPECT_THAT(overloads(1), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
