// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/KernelFacts.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <vector>

#include "bridges/pipewire/kernel/FakeKernel.h"
#include "support/manual/ManualEventLoop.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using std::chrono::seconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class KernelFactsTest : public ::testing::Test {
 protected:
  static constexpr std::int32_t kPlayer = 7;

  // The clocks of the kernel and of the loop.
  void advance(milliseconds time) {
    kernel.advance(time);
    clock.advance(time);
  }
  void sampleLater() { advance(KernelSampler::kInterval); }
  void audioRuns() { facts.audioRuns(std::vector<std::int32_t>{kPlayer}); }
  std::optional<ProcessFacts> player() const { return facts.process(kPlayer, nanoseconds(0), kEver); }
  MachineFacts machine() const { return facts.machine(nanoseconds(0), kEver); }

  static constexpr nanoseconds kEver = std::chrono::hours(24);

  FakeKernel kernel;
  ManualClock clock;
  ManualEventLoop loop{clock};
  KernelSampler sampler{kernel, kernel.roots()};
  KernelFacts facts{loop, clock, sampler, kernel.roots().proc};
};

TEST_F(KernelFactsTest, AddsTheSamplesOfEachThreadUpAndTakesTheLongestTimes) {
  kernel.set(kPlayer, 8, {});
  kernel.set(kPlayer, 9, {});
  audioRuns();
  kernel.set(kPlayer, 8, {.ranMs = 10, .waitedMs = 2, .majorFaults = 1});
  kernel.set(kPlayer, 9, {.ranMs = 3, .waitedMs = 20});
  sampleLater();
  kernel.set(kPlayer, 8, {.ranMs = 25, .waitedMs = 3, .majorFaults = 1});
  kernel.set(kPlayer, 9, {.ranMs = 4, .waitedMs = 41, .majorFaults = 4});
  sampleLater();
  ASSERT_TRUE(player());
  EXPECT_EQ(player()->ran, milliseconds(25));
  EXPECT_EQ(player()->waited, milliseconds(41));
  EXPECT_EQ(player()->interval, milliseconds(200));
  EXPECT_EQ(player()->majorFaults, 5U);
  EXPECT_TRUE(player()->isThreadKnown);
}

TEST_F(KernelFactsTest, CountsOnlySamplesOfTheTimeThatItIsAskedFor) {
  kernel.set(kPlayer, 8, {});
  kernel.setPressure("io", 0);
  audioRuns();  // at 100.0 s
  for (int i = 1; i <= 10; ++i) {
    kernel.set(kPlayer, 8, {.ranMs = 10 * i});
    kernel.setPressure("io", 5 * i);
    sampleLater();
  }
  const auto between = [&](int from, int to) {
    return facts.process(kPlayer, milliseconds(from), milliseconds(to));
  };
  EXPECT_EQ(between(100350, 100450)->ran, milliseconds(20));
  EXPECT_EQ(facts.machine(milliseconds(100350), milliseconds(100450)).ioStall, milliseconds(10));
  EXPECT_EQ(facts.machine(milliseconds(100350), milliseconds(100450)).interval, milliseconds(200));
  EXPECT_FALSE(between(200000, 300000));
}

TEST_F(KernelFactsTest, TellsTheStatesThatASampleSaw) {
  struct Case {
    FakeKernel::Thread thread;
    bool isStopped;
    bool isRunnable;
    bool isWaitingForDevice;
  };
  for (const Case& each :
       {Case{{.state = 'S'}, false, false, false}, Case{{.state = 'T'}, true, false, false},
        Case{{.state = 't'}, true, false, false}, Case{{.state = 'D'}, false, false, true},
        Case{{.state = 'R', .ranMs = 49}, false, true, false},
        // It has its processor.
        Case{{.state = 'R', .ranMs = 50}, false, false, false}}) {
    sampler.pause();
    kernel.set(kPlayer, 8, {});
    audioRuns();
    kernel.set(kPlayer, 8, each.thread);
    sampleLater();
    ASSERT_TRUE(player());
    EXPECT_EQ(player()->isStopped, each.isStopped) << each.thread.state;
    EXPECT_EQ(player()->isRunnable, each.isRunnable) << each.thread.ranMs;
    EXPECT_EQ(player()->isWaitingForDevice, each.isWaitingForDevice) << each.thread.state;
  }
}

TEST_F(KernelFactsTest, SaysThatAnAudioThreadHasNoRealTimePolicy) {
  kernel.set(kPlayer, 8, {.policy = SCHED_FIFO, .priority = 20});
  audioRuns();
  sampleLater();
  EXPECT_TRUE(player()->isRealTime);
  kernel.set(kPlayer, 8, {.policy = SCHED_OTHER});
  sampleLater();
  EXPECT_FALSE(player()->isRealTime);
}

TEST_F(KernelFactsTest, TellsOfAnyThreadWhenNoAudioThreadIsKnown) {
  kernel.set(kPlayer, 7, {.name = "player"});
  kernel.set(kPlayer, 8, {.name = "engine"});
  audioRuns();
  kernel.set(kPlayer, 8, {.name = "engine", .ranMs = 1, .waitedMs = 60});
  sampleLater();
  ASSERT_TRUE(player());
  EXPECT_FALSE(player()->isThreadKnown);
  EXPECT_FALSE(player()->isRealTime);
  EXPECT_EQ(player()->waited, milliseconds(60));
}

// The samples of the audio thread that has ended are still there.
TEST_F(KernelFactsTest, TellsOfAudioThreadsOnlyWhereOneIsKnown) {
  kernel.set(kPlayer, 7, {.name = "player"});
  kernel.set(kPlayer, 8, {});
  audioRuns();
  kernel.set(kPlayer, 8, {.ranMs = 5});
  sampleLater();
  kernel.end(kPlayer, 8);
  for (int i = 0; i < 12; ++i) sampleLater();
  kernel.set(kPlayer, 7, {.name = "player", .ranMs = 70, .waitedMs = 70});
  sampleLater();
  EXPECT_TRUE(player()->isThreadKnown);
  EXPECT_EQ(player()->ran, milliseconds(5));
  EXPECT_EQ(player()->waited, milliseconds(0));
}

TEST_F(KernelFactsTest, KnowsNothingOfAProcessBeforeItsSecondSample) {
  kernel.set(kPlayer, 8, {.ranMs = 1000});
  audioRuns();
  EXPECT_FALSE(player());
  EXPECT_FALSE(facts.process(99, nanoseconds(0), kEver));
  sampleLater();
  EXPECT_TRUE(player());
}

TEST_F(KernelFactsTest, AddsUpWhatTheMachineDid) {
  for (const char* kind : {"cpu", "memory", "io"}) kernel.setPressure(kind, 1000);
  audioRuns();
  kernel.setPressure("cpu", 1040);
  kernel.setPressure("memory", 1003);
  kernel.setPressure("io", 1090);
  sampleLater();
  kernel.setPressure("cpu", 1050);
  kernel.suspend(seconds(30));
  sampleLater();
  EXPECT_EQ(machine().interval, milliseconds(200));
  EXPECT_EQ(machine().cpuStall, milliseconds(50));
  EXPECT_EQ(machine().memoryStall, milliseconds(3));
  EXPECT_EQ(machine().ioStall, milliseconds(90));
  EXPECT_EQ(machine().slept, seconds(30));
}

TEST_F(KernelFactsTest, NamesTheProcessesThatHeldAProcessorLongestFirst) {
  const auto set = [&](int pid, int tid, int ranMs, int priority) {
    kernel.set(pid, tid, {.ranMs = ranMs, .policy = SCHED_FIFO, .priority = priority});
  };
  set(60, 60, 0, 10);
  set(70, 70, 0, 50);
  set(70, 71, 0, 20);
  kernel.write("proc/70/comm", "two\x1b threads\n");
  audioRuns();
  set(60, 60, 60, 10);
  set(70, 70, 40, 50);
  set(70, 71, 30, 20);
  sampleLater();
  set(70, 70, 50, 50);
  sampleLater();
  std::vector<std::string> texts;
  for (const ProcessorHolder& holder : machine().holders) {
    texts.push_back(std::to_string(holder.process) + " " + holder.name + " " +
                    std::to_string(holder.priority) + " " + std::to_string(holder.ran / milliseconds(1)));
  }
  EXPECT_THAT(texts, ElementsAre("70 two? threads 50 80", "60 process60 10 60"));
}

TEST_F(KernelFactsTest, GivesTheNameOfAProcessThatIsThereNow) {
  kernel.set(kPlayer, 8, {});
  EXPECT_EQ(facts.nameOf(kPlayer), "process7");
  EXPECT_EQ(facts.nameOf(99), "");
  EXPECT_EQ(facts.nameOf(0), "");
}

TEST_F(KernelFactsTest, SamplesWhileAudioRunsAndStopsWhenItNoLongerDoes) {
  kernel.set(kPlayer, 8, {});
  for (int i = 0; i < 5; ++i) {
    audioRuns();
    for (int sample = 0; sample < 10; ++sample) sampleLater();
  }
  EXPECT_EQ(machine().interval, seconds(5));
  for (nanoseconds time{0}; time < KernelFacts::kIdle; time += KernelSampler::kInterval) sampleLater();
  EXPECT_EQ(machine().interval, nanoseconds(0));
  EXPECT_FALSE(player());
  sampleLater();
  EXPECT_THAT(sampler.machineMoments(nanoseconds(0), kEver), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
