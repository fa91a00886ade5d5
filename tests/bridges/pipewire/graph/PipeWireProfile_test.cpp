// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireProfile.h"

#include <array>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits>
#include <spa/param/profiler.h>
#include <spa/pod/builder.h>

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using std::chrono::nanoseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// Builds a profiler's report: a structure of objects, one for each cycle.
class ProfileMaker {
 public:
  ProfileMaker() {
    spa_pod_builder_init(&builder_, bytes_.data(), kRoom);
    spa_pod_builder_push_struct(&builder_, &profile_);
  }

  struct Clock {
    std::uint32_t numerator = 1;
    std::uint32_t denominator = 48'000;
    std::int64_t position = 4'800;
    std::int64_t frames = 480;
  };
  struct Node {
    std::int32_t node = 36;
    std::int64_t signal = 1'000'000;
    std::int64_t finish = 3'000'000;
    std::int32_t status = 3;
    std::int64_t awake = 0;   // shortly after the signal
    std::int32_t xruns = -1;  // left out
  };

  ProfileMaker& beginCycle() {
    spa_pod_builder_push_object(&builder_, &cycle_, SPA_TYPE_OBJECT_Profiler, 0);
    return *this;
  }
  ProfileMaker& endCycle() {
    spa_pod_builder_pop(&builder_, &cycle_);
    return *this;
  }
  ProfileMaker& info(std::int64_t number, std::int32_t xruns) {
    spa_pod_frame frame = begin(SPA_PROFILER_info);
    spa_pod_builder_long(&builder_, number);
    for (int i = 0; i < 3; ++i) spa_pod_builder_float(&builder_, 0.25F);
    spa_pod_builder_int(&builder_, xruns);
    spa_pod_builder_pop(&builder_, &frame);
    return *this;
  }
  ProfileMaker& clock(const Clock& clock) {
    spa_pod_frame frame = begin(SPA_PROFILER_clock);
    spa_pod_builder_int(&builder_, 0);
    spa_pod_builder_int(&builder_, 7);
    spa_pod_builder_string(&builder_, "clock.test");
    spa_pod_builder_long(&builder_, 1'000'000);
    spa_pod_builder_fraction(&builder_, clock.numerator, clock.denominator);
    spa_pod_builder_long(&builder_, clock.position);
    spa_pod_builder_long(&builder_, clock.frames);
    spa_pod_builder_long(&builder_, 0);
    spa_pod_builder_double(&builder_, 1.0);
    spa_pod_builder_long(&builder_, 2'000'000);
    spa_pod_builder_pop(&builder_, &frame);
    return *this;
  }
  ProfileMaker& node(std::uint32_t key, const Node& node) {
    spa_pod_frame frame = begin(key);
    spa_pod_builder_int(&builder_, node.node);
    spa_pod_builder_string(&builder_, "name");
    spa_pod_builder_long(&builder_, 0);
    spa_pod_builder_long(&builder_, node.signal);
    spa_pod_builder_long(&builder_, node.awake == 0 ? node.signal + 10 : node.awake);
    spa_pod_builder_long(&builder_, node.finish);
    spa_pod_builder_int(&builder_, node.status);
    spa_pod_builder_fraction(&builder_, 480, 48'000);
    if (node.xruns >= 0) spa_pod_builder_int(&builder_, node.xruns);
    spa_pod_builder_pop(&builder_, &frame);
    return *this;
  }
  ProfileMaker& driver(const Node& block) { return node(SPA_PROFILER_driverBlock, block); }
  ProfileMaker& follower(const Node& block) { return node(SPA_PROFILER_followerBlock, block); }
  // A part that a later release may add.
  ProfileMaker& unknownPart() {
    spa_pod_builder_prop(&builder_, SPA_PROFILER_START_CUSTOM + 1, 0);
    spa_pod_builder_string(&builder_, "news");
    return *this;
  }
  ProfileMaker& cycle(const Clock& clockOfCycle, const Node& driverOfCycle) {
    return beginCycle().info(5, 2).clock(clockOfCycle).driver(driverOfCycle).endCycle();
  }

  std::vector<ProfiledCycle> cycles() {
    return cyclesOf(*static_cast<const spa_pod*>(spa_pod_builder_pop(&builder_, &profile_)));
  }

 private:
  spa_pod_frame begin(std::uint32_t key) {
    spa_pod_frame frame{};
    spa_pod_builder_prop(&builder_, key, 0);
    spa_pod_builder_push_struct(&builder_, &frame);
    return frame;
  }

  static constexpr std::uint32_t kRoom = 8192;
  alignas(8) std::array<std::uint8_t, kRoom> bytes_{};
  spa_pod_builder builder_{};
  spa_pod_frame profile_{};
  spa_pod_frame cycle_{};
};

TEST(PipeWireProfile, ReadsACycleAndItsFollowers) {
  ProfileMaker maker;
  maker.beginCycle().info(91, 3).clock({}).driver({}).unknownPart();
  maker.follower({.node = 42}).follower({.node = 43, .status = 1, .xruns = 8}).endCycle();
  const std::vector<ProfiledCycle> cycles = maker.cycles();
  ASSERT_THAT(cycles, SizeIs(1));
  EXPECT_EQ(cycles[0].driver, 36U);
  EXPECT_EQ(cycles[0].number, 91U);
  EXPECT_EQ(cycles[0].xruns, 3U);
  EXPECT_EQ(cycles[0].position, 4'800U);
  EXPECT_EQ(cycles[0].frames, 480U);
  EXPECT_EQ(cycles[0].period, microseconds(10'000));
  EXPECT_EQ(cycles[0].begin, nanoseconds(1'000'000));
  EXPECT_EQ(cycles[0].processing, nanoseconds(2'000'000));
  EXPECT_EQ(cycles[0].hertz, 48'000U);
  const auto at = [](std::int64_t time) { return std::optional(nanoseconds(time)); };
  EXPECT_THAT(
      cycles[0].followers,
      ElementsAre(
          ProfiledFollower{
              42, true, std::nullopt, {NodeTimes::kFinished, at(1'000'000), at(1'000'010), at(3'000'000)}},
          ProfiledFollower{43, false, 8, {NodeTimes::kSignalled, at(1'000'000), {}, {}}}));
}

// Until a node has reached a point of its cycle, the time of that point is of an earlier cycle.
TEST(PipeWireProfile, LeavesOutTimesOfEarlierCycles) {
  ProfileMaker maker;
  maker.beginCycle().info(91, 3).clock({}).driver({});
  maker.follower({.status = 0}).follower({.status = 1}).follower({.status = 2});
  // It was still busy when it was signalled, and finished two cycles at once.
  maker.follower({.status = 3, .awake = 900'000}).follower({.status = 7}).endCycle();
  const std::vector<ProfiledCycle> cycles = maker.cycles();
  ASSERT_THAT(cycles, SizeIs(1));
  std::vector<std::string> known;
  for (const ProfiledFollower& follower : cycles[0].followers) {
    const NodeTimes& times = follower.times;
    known.push_back(std::string(times.signal ? "signal " : "") + (times.awake ? "awake " : "") +
                    (times.finish ? "finish" : ""));
  }
  EXPECT_THAT(known, ElementsAre("", "signal ", "signal awake ", "signal finish", ""));
}

TEST(PipeWireProfile, ReadsTheCyclesOfSeveralDriversInTheirOrder) {
  ProfileMaker maker;
  maker.cycle({}, {.node = 36}).cycle({}, {.node = 50}).cycle({}, {.node = 36});
  std::vector<std::uint32_t> drivers;
  for (const ProfiledCycle& cycle : maker.cycles()) drivers.push_back(cycle.driver);
  EXPECT_THAT(drivers, ElementsAre(36, 50, 36));
}

TEST(PipeWireProfile, HasNoTimesForACycleThatBeganBeforeTheProfiler) {
  ProfileMaker maker;
  maker.cycle({}, {.signal = 0, .finish = 11'884'633'242'569});
  const std::vector<ProfiledCycle> cycles = maker.cycles();
  ASSERT_THAT(cycles, SizeIs(1));
  EXPECT_EQ(cycles[0].begin, std::nullopt);
  EXPECT_EQ(cycles[0].processing, std::nullopt);
}

TEST(PipeWireProfile, HasNoProcessingTimeThatIsImpossible) {
  ProfileMaker maker;
  maker.cycle({}, {.signal = 2'000, .finish = 1'000});
  maker.cycle({}, {.signal = 1, .finish = std::numeric_limits<std::int64_t>::max()});
  const std::vector<ProfiledCycle> cycles = maker.cycles();
  ASSERT_THAT(cycles, SizeIs(2));
  for (const ProfiledCycle& cycle : cycles) {
    EXPECT_NE(cycle.begin, std::nullopt);
    EXPECT_EQ(cycle.processing, std::nullopt);
  }
}

// Clients can write to the memory that these numbers come from.
TEST(PipeWireProfile, LeavesOutACycleWithAnImpossibleClock) {
  constexpr std::int64_t kEndless = std::numeric_limits<std::int64_t>::max();
  constexpr std::uint32_t kHuge = std::numeric_limits<std::uint32_t>::max();
  for (const ProfileMaker::Clock& clock :
       {ProfileMaker::Clock{.frames = 0}, ProfileMaker::Clock{.frames = -1},
        ProfileMaker::Clock{.frames = kEndless}, ProfileMaker::Clock{.denominator = 0},
        ProfileMaker::Clock{.numerator = 0}, ProfileMaker::Clock{.numerator = kHuge},
        ProfileMaker::Clock{.denominator = kHuge}, ProfileMaker::Clock{.numerator = 1'000'000}}) {
    ProfileMaker maker;
    EXPECT_THAT(maker.cycle(clock, {}).cycles(), IsEmpty())
        << clock.frames << " " << clock.numerator << "/" << clock.denominator;
  }
}

TEST(PipeWireProfile, LeavesOutACycleThatLacksAPart) {
  ProfileMaker noInfo;
  EXPECT_THAT(noInfo.beginCycle().clock({}).driver({}).endCycle().cycles(), IsEmpty());
  ProfileMaker noClock;
  EXPECT_THAT(noClock.beginCycle().info(1, 0).driver({}).endCycle().cycles(), IsEmpty());
  ProfileMaker noDriver;
  EXPECT_THAT(noDriver.beginCycle().info(1, 0).clock({}).endCycle().cycles(), IsEmpty());
}

TEST(PipeWireProfile, ReadsNoCyclesFromAPodThatIsNotAProfile) {
  constexpr std::uint32_t kRoom = 64;
  alignas(8) std::array<std::uint8_t, kRoom> bytes{};
  spa_pod_builder builder{};
  spa_pod_builder_init(&builder, bytes.data(), kRoom);
  spa_pod_builder_string(&builder, "neither");
  EXPECT_THAT(cyclesOf(*reinterpret_cast<const spa_pod*>(bytes.data())), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
