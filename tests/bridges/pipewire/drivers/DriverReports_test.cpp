// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/DriverReports.h"

#include <filesystem>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/TemporaryDirectory.h"
#include "support/manual/ManualEventLoop.h"
#include "support/memory/MemoryGlitchFacts.h"
#include "support/memory/MemorySessionSink.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// Has a sink that drives two streams, each with a session.
class DriverReportsTest : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kSpeaker = 36;
  static constexpr std::uint32_t kFirst = 42;
  static constexpr std::uint32_t kSecond = 43;

  void SetUp() override {
    model.complete();
    addDriver(kSpeaker, "Audio/Sink", "speaker");
    for (const std::uint32_t stream : {kFirst, kSecond}) {
      model.nodeAppeared(stream, {{std::string(kMediaClassKey), "Stream/Output/Audio"},
                                  {std::string(kNodeNameKey), stream == kFirst ? "first" : "second"}});
      model.nodeDescribed(stream, true, {});
      model.linkAppeared(stream + 100, stream, kSpeaker);
    }
    ASSERT_THAT(sink.sessions, SizeIs(2));
    clock.advance(10.0);
    run();
  }
  void addDriver(std::uint32_t node, const char* mediaClass, const char* name) {
    model.nodeAppeared(node, {{std::string(kMediaClassKey), mediaClass}, {std::string(kNodeNameKey), name}});
    model.nodeDescribed(node, true, {{std::string(kNodeDriverKey), "true"}});
  }

  // A cycle in which no node is late.
  ProfiledCycle cycle() {
    ProfiledCycle cycle;
    cycle.driver = kSpeaker;
    cycle.number = ++number;
    cycle.position = number * 1024;
    cycle.frames = 1024;
    cycle.period = milliseconds(21);
    cycle.begin = clock.monotonic() - milliseconds(1000) + milliseconds(21) * number;
    cycle.processing = milliseconds(1);
    cycle.xruns = driverXruns;
    cycle.followers = {{kFirst, true, {}}, {kSecond, true, {}}};
    return cycle;
  }
  ProfiledCycle cycleWithLateFirst() {
    ProfiledCycle late = cycle();
    late.followers[0].hasFinished = false;
    late.processing = late.period + milliseconds(1);
    return late;
  }
  void run() { drivers.profiled({cycle()}); }
  // The cycles of one report. An overload is known when the next cycle has begun.
  void report(std::vector<ProfiledCycle> cycles) {
    cycles.push_back(cycle());
    drivers.profiled(cycles);
  }

  // The overloads that were reported to a stream's session.
  std::vector<ValueMap> overloads(std::size_t session) const {
    std::vector<ValueMap> found;
    for (const MemorySessionSink::Message& message : sink.sessions.at(session).messages) {
      if (message.category == 7 && message.type == 6) found.push_back(message.payload);
    }
    return found;
  }
  std::int64_t cyclesOf(const std::string& subgroup) const {
    const ValueMap content = statistics.channelsOf("graph");
    for (const Value& channel : *content.find("channels")->asArray()) {
      const ValueMap& map = *channel.asMap();
      if (map.text("name") == "Cycles" && map.contains("subgroup") && map.text("subgroup") == subgroup) {
        return map.integer("value");
      }
    }
    return -1;
  }

  const TemporaryDirectory directory;
  ManualClock clock;
  ManualEventLoop loop{clock};
  Console console{false};
  MemorySessionSink sink;
  ReporterIdentifiers identifiers{clock, 1};
  DriverStatistics statistics;
  ChannelPublisher publisher{loop, clock, console, "graph.json",
                             [this] { return statistics.channelsOf("graph"); }};
  StreamReports streams{sink, clock, identifiers, loop};
  GraphModel model{streams};
  MemoryGlitchFacts facts;
  GlitchReports glitches{model, streams, facts, clock};
  DriverReports drivers{model, statistics, glitches, publisher};
  std::uint64_t number = 0;
  std::uint32_t driverXruns = 0;
};

TEST_F(DriverReportsTest, ReportsAnOverloadToTheLateStreamOnly) {
  const ProfiledCycle late = cycleWithLateFirst();
  report({late});
  ASSERT_THAT(overloads(0), SizeIs(1));
  const ValueMap overload = overloads(0)[0];
  EXPECT_EQ(overload.text("issue_type"), "overload");
  EXPECT_EQ(overload.integer("smallest_buffer_frame_size"), 1024);
  EXPECT_EQ(overload.integer("io_cycle"), 2);
  EXPECT_EQ(overload.integer("xrun_count"), 1);
  EXPECT_NEAR(overload.number("twreporting_timestamp"), clock.now() - 1.0 + 0.042, 0.001);
  EXPECT_THAT(overloads(1), IsEmpty());
}

TEST_F(DriverReportsTest, ReportsADriversXrunsToEveryStreamItServes) {
  driverXruns = 2;
  report({});
  run();
  ASSERT_THAT(overloads(0), SizeIs(1));
  ASSERT_THAT(overloads(1), SizeIs(1));
  EXPECT_EQ(overloads(1)[0].integer("xrun_count"), 2);
}

TEST_F(DriverReportsTest, AddsUpTheOverloadsOfOneProfile) {
  report({cycleWithLateFirst(), cycle(), cycleWithLateFirst()});
  clock.advance(1.0);
  ASSERT_THAT(overloads(0), SizeIs(2));
  EXPECT_EQ(overloads(0)[0].integer("xrun_count"), 1);
  EXPECT_EQ(overloads(0)[1].integer("xrun_count"), 1);
  EXPECT_EQ(overloads(0)[1].integer("io_cycle"), 4);
}

TEST_F(DriverReportsTest, ReportsNothingWhenNoNodeIsLate) {
  run();
  run();
  EXPECT_THAT(overloads(0), IsEmpty());
}

TEST_F(DriverReportsTest, UsesThePresentTimeInPlaceOfAnImpossibleOne) {
  ProfiledCycle future = cycleWithLateFirst();
  future.begin = clock.monotonic() + milliseconds(1);
  ProfiledCycle next = cycle();
  next.begin = *future.begin + next.period;
  drivers.profiled({future, next});
  EXPECT_EQ(overloads(0).at(0).number("twreporting_timestamp"), clock.now());
}

TEST_F(DriverReportsTest, CountsTheCyclesOfDriversThatAreSinksOrSources) {
  addDriver(50, "Audio/Source", "microphone");
  EXPECT_EQ(cyclesOf("speaker"), 1);
  EXPECT_EQ(cyclesOf("microphone"), 0);
  ProfiledCycle other = cycle();
  other.driver = 50;
  ProfiledCycle unknown = cycle();
  unknown.driver = 77;
  drivers.profiled({other, unknown, cycle()});
  EXPECT_EQ(cyclesOf("microphone"), 1);
  EXPECT_EQ(cyclesOf("speaker"), 2);
}

TEST_F(DriverReportsTest, PublishesNewDriversAndCycles) {
  publisher.open(directory.path());
  const std::string file = directory.path("channels/graph.json");
  const std::uintmax_t before = std::filesystem::file_size(file);
  addDriver(50, "Audio/Source", "microphone");
  clock.advance(1.0);
  EXPECT_GT(std::filesystem::file_size(file), before);

  std::filesystem::remove(file);
  run();
  clock.advance(1.0);
  EXPECT_TRUE(std::filesystem::exists(file));
}

// The graph numbers its nodes again from the start after a restart.
TEST_F(DriverReportsTest, DoesNotReportTheEarlierXrunsOfANewDriver) {
  driverXruns = 3;
  model.removed(kSpeaker);
  addDriver(kSpeaker, "Audio/Sink", "headset");
  run();
  EXPECT_THAT(overloads(0), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
