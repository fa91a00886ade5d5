// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/KernelSampler.h"

#include <algorithm>
#include <array>
#include <dirent.h>
#include <gmock/gmock.h>
#include <pthread.h>
#include <set>
#include <string>
#include <unistd.h>
#include <vector>

#include "bridges/pipewire/kernel/FakeKernel.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using std::chrono::seconds;
using testing::DoubleNear;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

constexpr nanoseconds kEver = std::chrono::hours(24);

std::size_t openDescriptors() {
  std::size_t count = 0;
  DIR* directory = ::opendir("/proc/self/fd");
  while (directory != nullptr && ::readdir(directory) != nullptr) ++count;
  if (directory != nullptr) ::closedir(directory);
  return count;
}

class KernelSamplerTest : public testing::Test {
 protected:
  void watch(std::vector<std::int32_t> processes) { sampler_.watch(processes); }
  void sampleLater() {
    kernel_.advance(KernelSampler::kInterval);
    sampler_.sample();
  }
  std::vector<ThreadMoment> threads(std::int32_t pid) const {
    return sampler_.threadMoments(pid, nanoseconds(0), kEver);
  }
  std::vector<std::int32_t> watched(std::int32_t pid) const {
    std::set<std::int32_t> found;
    for (const ThreadMoment& moment : threads(pid)) found.insert(moment.tid);
    return {found.begin(), found.end()};
  }
  std::vector<MachineMoment> machine() const { return sampler_.machineMoments(nanoseconds(0), kEver); }
  MachineMoment newest() const { return machine().back(); }

  FakeKernel kernel_;
  KernelSampler sampler_{kernel_, kernel_.roots()};
};

TEST_F(KernelSamplerTest, SaysHowLongAThreadRanAndWaitedSinceTheSampleBefore) {
  FakeKernel::Thread thread{.ranMs = 1000, .waitedMs = 50, .majorFaults = 3};
  kernel_.set(7, 8, thread);
  watch({7});
  sampler_.sample();
  thread = {
      .state = 'D', .ranMs = 1030, .waitedMs = 62, .majorFaults = 5, .policy = SCHED_RR, .priority = 20};
  kernel_.set(7, 8, thread);
  sampleLater();

  ASSERT_THAT(threads(7), SizeIs(2));
  const ThreadMoment first = threads(7)[0];
  EXPECT_EQ(first.interval, nanoseconds(0));
  EXPECT_EQ(first.ran, nanoseconds(0));
  const ThreadMoment second = threads(7)[1];
  EXPECT_EQ(second.pid, 7);
  EXPECT_EQ(second.tid, 8);
  EXPECT_EQ(second.interval, milliseconds(100));
  EXPECT_EQ(second.ran, milliseconds(30));
  EXPECT_EQ(second.waited, milliseconds(12));
  EXPECT_EQ(second.majorFaults, 2u);
  EXPECT_EQ(second.state, 'D');
  EXPECT_EQ(second.policy, SCHED_RR);
  EXPECT_EQ(second.priority, 20);
}

TEST_F(KernelSamplerTest, FollowsThreadsNamedByPipeWireAndRealTimeOnesOnly) {
  kernel_.set(7, 7, {.name = "player"});
  kernel_.set(7, 8, {.name = "data-loop.0"});
  kernel_.set(7, 9, {.name = "mixer (1) S", .policy = SCHED_FIFO, .priority = 88});
  watch({7});
  sampler_.sample();
  EXPECT_THAT(watched(7), ElementsAre(8, 9));
}

TEST_F(KernelSamplerTest, FindsThreadsThatAWatchedProcessStartsLater) {
  kernel_.set(7, 7, {.name = "player"});
  watch({7});
  sampleLater();
  kernel_.set(7, 8, {});
  for (int i = 0; i < 12; ++i) sampleLater();
  EXPECT_THAT(watched(7), ElementsAre(8));
  EXPECT_TRUE(threads(7).back().isAudio);
}

TEST_F(KernelSamplerTest, WatchesAllThreadsOfAProcessWithoutAKnownAudioThread) {
  for (int tid = 7; tid < 10; ++tid) kernel_.set(7, tid, {.name = "player"});
  watch({7});
  sampleLater();
  kernel_.set(7, 9, {.name = "player", .ranMs = 4, .waitedMs = 40});
  sampleLater();
  EXPECT_THAT(watched(7), ElementsAre(7, 8, 9));
  nanoseconds waited{0};
  for (const ThreadMoment& moment : threads(7)) {
    EXPECT_FALSE(moment.isAudio);
    if (moment.tid == 9) waited += moment.waited;
  }
  EXPECT_EQ(waited, milliseconds(40));
}

TEST_F(KernelSamplerTest, WatchesTheThreadsThatSuchAProcessStartsLater) {
  kernel_.set(7, 7, {.name = "player"});
  watch({7});
  sampleLater();
  kernel_.set(7, 8, {.name = "worker"});
  for (int i = 0; i < 12; ++i) sampleLater();
  EXPECT_THAT(watched(7), ElementsAre(7, 8));
}

TEST_F(KernelSamplerTest, WatchesTheOtherThreadsAgainWhenTheAudioThreadHasEnded) {
  kernel_.set(7, 7, {.name = "player"});
  kernel_.set(7, 8, {});
  watch({7});
  sampleLater();
  kernel_.end(7, 8);
  for (int i = 0; i < 12; ++i) sampleLater();
  EXPECT_THAT(watched(7), ElementsAre(7, 8));
  EXPECT_EQ(threads(7).back().tid, 7);
  EXPECT_FALSE(threads(7).back().isAudio);
}

// Without the one that matters, the others would only mislead.
TEST_F(KernelSamplerTest, WatchesNoneOfMoreThreadsThanItsLimits) {
  constexpr int kMost = KernelSampler::kMaxOthersOfProcess;
  for (int i = 0; i < kMost; ++i) kernel_.set(1, 100 + i, {.name = "player"});
  watch({1});
  sampleLater();
  EXPECT_THAT(watched(1), SizeIs(kMost));
  kernel_.set(1, 100 + kMost, {.name = "player"});
  for (int i = 0; i < 12; ++i) sampleLater();
  EXPECT_THAT(watched(1), IsEmpty());
}

TEST_F(KernelSamplerTest, WatchesAudioThreadsBesideAsManyOthersAsItMay) {
  std::vector<std::int32_t> processes;
  for (int pid = 1; pid <= 9; ++pid) {
    processes.push_back(pid);
    for (int i = 0; i < 10; ++i) kernel_.set(pid, pid * 100 + i, {.name = "player"});
  }
  kernel_.set(10, 1000, {});
  processes.push_back(10);
  watch(processes);
  sampleLater();
  std::size_t others = 0;
  for (int pid = 1; pid <= 9; ++pid) {
    EXPECT_THAT(watched(pid), testing::AnyOf(IsEmpty(), SizeIs(10)));
    others += watched(pid).size();
  }
  EXPECT_EQ(others, 60u);
  EXPECT_LE(others, KernelSampler::kMaxOthers);
  EXPECT_THAT(watched(10), ElementsAre(1000));
}

// Threads that come and go leave no more samples behind than the limit allows.
TEST_F(KernelSamplerTest, KeepsTheSamplesOfAFewOfManyThreadsThatEnded) {
  constexpr int kMost = KernelSampler::kMaxOthersOfProcess;
  kernel_.set(7, 7, {.name = "player"});
  watch({7});
  for (int tid = 100; tid < 100 + 2 * kMost; ++tid) {
    kernel_.set(7, tid, {.name = "worker"});
    for (int i = 0; i < 10; ++i) sampleLater();
    kernel_.end(7, tid);
  }
  EXPECT_LE(watched(7).size(), KernelSampler::kMaxOthersOfProcess);
  EXPECT_EQ(watched(7).front(), 7);
}

// Programs name a thread after they have started it.
TEST_F(KernelSamplerTest, FindsAThreadThatIsNamedAfterTheFirstLook) {
  kernel_.set(7, 8, {.name = "player"});
  watch({7});
  kernel_.set(7, 8, {.name = "data-loop.0"});
  sampleLater();
  EXPECT_THAT(threads(7), SizeIs(1));
}

TEST_F(KernelSamplerTest, KeepsAThreadThatLostItsRealTimePolicy) {
  kernel_.set(7, 8, {.name = "engine", .policy = SCHED_FIFO, .priority = 10});
  watch({7});
  sampleLater();
  kernel_.set(7, 8, {.name = "engine", .policy = SCHED_OTHER});
  for (int i = 0; i < 25; ++i) sampleLater();
  EXPECT_EQ(threads(7).back().policy, SCHED_OTHER);
  EXPECT_THAT(threads(7), SizeIs(26));
}

TEST_F(KernelSamplerTest, KeepsWhatItKnowsOfAThreadThatEnded) {
  kernel_.set(7, 8, {});
  watch({7});
  sampleLater();
  kernel_.end(7, 8);
  for (int i = 0; i < 15; ++i) sampleLater();
  EXPECT_THAT(threads(7), SizeIs(1));
  watch({});
  EXPECT_THAT(threads(7), IsEmpty());
}

// A counter that goes back belongs to another thread that got the number of the first.
TEST_F(KernelSamplerTest, CountsNothingWhenACounterGoesBack) {
  kernel_.set(7, 8, {.ranMs = 1000, .waitedMs = 1000, .majorFaults = 10});
  watch({7});
  sampleLater();
  kernel_.set(7, 8, {.ranMs = 1, .waitedMs = 1, .majorFaults = 1});
  sampleLater();
  EXPECT_EQ(threads(7).back().ran, nanoseconds(0));
  EXPECT_EQ(threads(7).back().waited, nanoseconds(0));
  EXPECT_EQ(threads(7).back().majorFaults, 0u);
}

TEST_F(KernelSamplerTest, TellsTheStateOfAThreadWithoutRunTimes) {
  kernel_.set(7, 8, {.state = 'T'});
  kernel_.remove("proc/7/task/8/schedstat");
  watch({7});
  sampleLater();
  sampleLater();
  EXPECT_EQ(threads(7).back().state, 'T');
  EXPECT_EQ(threads(7).back().ran, nanoseconds(0));
}

TEST_F(KernelSamplerTest, FindsTheSamplesWhoseIntervalTouchesATime) {
  kernel_.set(7, 8, {});
  watch({7});
  for (int i = 0; i < 10; ++i) sampleLater();  // at 100.1 to 101.0 s
  const auto found = sampler_.threadMoments(7, milliseconds(100350), milliseconds(100450));
  ASSERT_THAT(found, SizeIs(2));
  EXPECT_EQ(found[0].at, milliseconds(100400));
  EXPECT_EQ(found[1].at, milliseconds(100500));
  EXPECT_THAT(sampler_.machineMoments(milliseconds(100350), milliseconds(100450)), SizeIs(2));
  EXPECT_THAT(sampler_.machineMoments(seconds(200), seconds(300)), IsEmpty());
}

TEST_F(KernelSamplerTest, KeepsOnlyTheLastSamples) {
  kernel_.set(7, 8, {});
  watch({7});
  for (std::size_t i = 0; i < 3 * KernelSampler::kKept; ++i) sampleLater();
  EXPECT_THAT(threads(7), SizeIs(KernelSampler::kKept));
  EXPECT_THAT(machine(), SizeIs(KernelSampler::kKept));
}

TEST_F(KernelSamplerTest, WatchesNoMoreThreadsThanItsLimits) {
  std::vector<std::int32_t> processes;
  for (int pid = 1; pid <= 100; ++pid) {
    processes.push_back(pid);
    for (int i = 0; i < 12; ++i) kernel_.set(pid, pid * 100 + i, {});
  }
  watch({1});
  sampleLater();
  EXPECT_THAT(threads(1), SizeIs(KernelSampler::kMaxThreadsOfProcess));
  watch(processes);
  sampleLater();
  std::size_t count = 0;
  for (const std::int32_t pid : processes) {
    count += sampler_.threadMoments(pid, newest().at, newest().at).size();
  }
  EXPECT_EQ(count, KernelSampler::kMaxThreads);
}

TEST_F(KernelSamplerTest, SaysHowLongProcessesWaitedForTheMachine) {
  for (const char* kind : {"cpu", "memory", "io"}) kernel_.setPressure(kind, 5000);
  sampleLater();
  EXPECT_EQ(newest().ioStall, nanoseconds(0));
  kernel_.setPressure("cpu", 5040);
  kernel_.setPressure("memory", 5003);
  kernel_.setPressure("io", 5090);
  sampleLater();
  EXPECT_EQ(newest().interval, milliseconds(100));
  EXPECT_EQ(newest().cpuStall, milliseconds(40));
  EXPECT_EQ(newest().memoryStall, milliseconds(3));
  EXPECT_EQ(newest().ioStall, milliseconds(90));
}

TEST_F(KernelSamplerTest, SaysThatTheSystemSlept) {
  sampleLater();
  kernel_.suspend(seconds(30));
  sampleLater();
  EXPECT_EQ(newest().slept, seconds(30));
  EXPECT_THAT(newest().wallJump, DoubleNear(0.0, 1e-6));
  sampleLater();
  EXPECT_EQ(newest().slept, nanoseconds(0));
}

TEST_F(KernelSamplerTest, SaysThatTheClockWasSet) {
  sampleLater();
  kernel_.setClock(seconds(-3600));
  sampleLater();
  EXPECT_THAT(newest().wallJump, DoubleNear(-3600.0, 1e-6));
  EXPECT_EQ(newest().slept, nanoseconds(0));
}

TEST_F(KernelSamplerTest, NamesARealTimeThreadThatHeldAProcessor) {
  kernel_.set(50, 50, {.name = "innocent", .policy = SCHED_FIFO, .priority = 20});
  kernel_.set(60, 61, {.name = "worker", .ranMs = 7000, .policy = SCHED_RR, .priority = 90});
  sampleLater();
  EXPECT_THAT(newest().hogs(), IsEmpty());
  kernel_.set(60, 61, {.name = "worker", .ranMs = 7080, .policy = SCHED_RR, .priority = 90});
  sampleLater();
  ASSERT_THAT(newest().hogs(), SizeIs(1));
  const Hog hog = newest().hogs()[0];
  EXPECT_EQ(hog.pid, 60);
  EXPECT_EQ(hog.tid, 61);
  EXPECT_EQ(hog.name.view(), "worker");
  EXPECT_EQ(hog.process.view(), "process60");
  EXPECT_EQ(hog.ran, milliseconds(80));
  EXPECT_EQ(hog.policy, SCHED_RR);
  EXPECT_EQ(hog.priority, 90);
  EXPECT_EQ(hog.processor, 1);
}

TEST_F(KernelSamplerTest, GivesTheLongestHogsFirstAndNoMoreThanItsLimit) {
  for (int pid = 60; pid < 70; ++pid) kernel_.set(pid, pid, {.policy = SCHED_FIFO, .priority = 1});
  sampleLater();
  for (int pid = 60; pid < 70; ++pid) {
    kernel_.set(pid, pid, {.ranMs = 10 + (pid * 7) % 10, .policy = SCHED_FIFO, .priority = 1});
  }
  sampleLater();
  std::vector<nanoseconds> ran;
  const MachineMoment moment = newest();
  for (const Hog& hog : moment.hogs()) ran.push_back(hog.ran);
  EXPECT_THAT(ran, ElementsAre(milliseconds(19), milliseconds(18), milliseconds(17), milliseconds(16)));
}

TEST_F(KernelSamplerTest, FindsARealTimeProcessThatCameLaterWithinASecond) {
  for (int pid = 1000; pid < 1400; ++pid) kernel_.set(pid, pid, {.name = "idle"});
  for (int i = 0; i < 60; ++i) sampleLater();
  kernel_.set(60, 61, {.policy = SCHED_FIFO, .priority = 50});
  for (int i = 0; i < 10; ++i) sampleLater();
  kernel_.set(60, 61, {.ranMs = 90, .policy = SCHED_FIFO, .priority = 50});
  sampleLater();
  EXPECT_THAT(newest().hogs(), SizeIs(1));
}

TEST_F(KernelSamplerTest, FindsAThreadThatBecameRealTimeLater) {
  for (int pid = 1000; pid < 1100; ++pid) kernel_.set(pid, pid, {.name = "idle"});
  for (int i = 0; i < 20; ++i) sampleLater();
  kernel_.set(1050, 1050, {.policy = SCHED_FIFO, .priority = 50});
  for (int i = 0; i < 30; ++i) sampleLater();
  kernel_.set(1050, 1050, {.ranMs = 90, .policy = SCHED_FIFO, .priority = 50});
  sampleLater();
  EXPECT_THAT(newest().hogs(), SizeIs(1));
}

TEST_F(KernelSamplerTest, SuspectsOnlyInterruptThreadsAmongTheKernelsOwn) {
  constexpr long kKernelThread = 0x00200000;
  kernel_.set(11, 11, {.name = "migration/0", .policy = SCHED_FIFO, .priority = 99, .flags = kKernelThread});
  kernel_.set(12, 12, {.name = "irq/17-snd", .policy = SCHED_FIFO, .priority = 50, .flags = kKernelThread});
  sampleLater();
  kernel_.set(11, 11, {.name = "migration/0", .ranMs = 90, .policy = SCHED_FIFO, .flags = kKernelThread});
  kernel_.set(12, 12, {.name = "irq/17-snd", .ranMs = 90, .policy = SCHED_FIFO, .flags = kKernelThread});
  sampleLater();
  ASSERT_THAT(newest().hogs(), SizeIs(1));
  EXPECT_EQ(newest().hogs()[0].name.view(), "irq/17-snd");
}

TEST_F(KernelSamplerTest, TellsTheFastestProcessorsFrequencyAndThatOneWasThrottled) {
  for (const char* processor : {"cpu0", "cpu1"}) {
    const std::string directory = std::string("sys/devices/system/cpu/") + processor;
    kernel_.write(directory + "/cpufreq/cpuinfo_max_freq", "4000000\n");
    kernel_.write(directory + "/cpufreq/scaling_cur_freq", "800000\n");
    kernel_.write(directory + "/thermal_throttle/core_throttle_count", "12\n");
  }
  sampleLater();
  EXPECT_EQ(newest().frequencyPerMille, 200u);
  EXPECT_FALSE(newest().isThrottled);
  kernel_.write("sys/devices/system/cpu/cpu1/cpufreq/scaling_cur_freq", "3000000\n");
  kernel_.write("sys/devices/system/cpu/cpu1/thermal_throttle/core_throttle_count", "13\n");
  sampleLater();
  sampleLater();
  EXPECT_EQ(newest().frequencyPerMille, 750u);
  EXPECT_TRUE(newest().isThrottled);
  sampleLater();
  sampleLater();
  EXPECT_FALSE(newest().isThrottled);
}

TEST_F(KernelSamplerTest, TellsTheStateOfOpenSoundCards) {
  kernel_.write("proc/asound/card1/pcm0p/sub0/status",
                "state: XRUN\ntrigger_time: 1.0\ntstamp      : 0.0\ndelay       : 480\navail       : 0\n"
                "hw_ptr      : 48000\nappl_ptr    : 48480\n");
  kernel_.write("proc/asound/card1/pcm0c/sub0/status", "closed\n");
  sampleLater();
  ASSERT_THAT(newest().pcms(), SizeIs(1));
  const PcmMoment pcm = newest().pcms()[0];
  EXPECT_EQ(pcm.card, 1);
  EXPECT_EQ(pcm.device, 0);
  EXPECT_TRUE(pcm.isPlayback);
  EXPECT_TRUE(pcm.isXrun);
  EXPECT_EQ(pcm.delay, 480);
}

TEST_F(KernelSamplerTest, SaysNothingOfWhatTheKernelDoesNotTell) {
  watch({7, -1, 0});
  sampleLater();
  sampleLater();
  EXPECT_THAT(threads(7), IsEmpty());
  EXPECT_EQ(newest().cpuStall, nanoseconds(0));
  EXPECT_EQ(newest().frequencyPerMille, 0u);
  EXPECT_THAT(newest().hogs(), IsEmpty());
  EXPECT_THAT(newest().pcms(), IsEmpty());
}

TEST_F(KernelSamplerTest, BeginsAnewAfterAPause) {
  kernel_.set(7, 8, {});
  kernel_.setPressure("cpu", 5000);
  watch({7});
  sampleLater();
  sampler_.pause();
  EXPECT_THAT(threads(7), IsEmpty());
  EXPECT_THAT(machine(), IsEmpty());
  kernel_.set(7, 8, {.ranMs = 5000});
  kernel_.setPressure("cpu", 9000);
  kernel_.suspend(seconds(60));
  sampleLater();
  ASSERT_THAT(threads(7), SizeIs(1));
  EXPECT_EQ(threads(7)[0].ran, nanoseconds(0));
  EXPECT_EQ(newest().cpuStall, nanoseconds(0));
  EXPECT_EQ(newest().slept, nanoseconds(0));
}

TEST_F(KernelSamplerTest, HoldsNoFilesWhilePaused) {
  const std::size_t before = openDescriptors();
  kernel_.set(7, 8, {.policy = SCHED_FIFO});
  for (const char* kind : {"cpu", "memory", "io"}) kernel_.setPressure(kind, 1);
  watch({7});
  sampleLater();
  EXPECT_GT(openDescriptors(), before);
  sampler_.pause();
  EXPECT_EQ(openDescriptors(), before);
}

// The kernel of the machine that runs the test.
TEST(RealKernelTest, TellsWhatThisProcessDid) {
  const LinuxKernelCalls calls;
  EXPECT_GE(calls.policyOf(::getpid()), 0);
  EXPECT_EQ(calls.policyOf(-1), -1);
  KernelSampler sampler(calls);
  sampler.sample();
  sampler.sample();
  const auto machine = sampler.machineMoments(nanoseconds(0), nanoseconds::max());
  ASSERT_THAT(machine, SizeIs(2));
  EXPECT_EQ(machine[0].interval, nanoseconds(0));
  EXPECT_GT(machine[1].interval, nanoseconds(0));
  EXPECT_THAT(machine[1].slept.count(), testing::AllOf(testing::Gt(-1000000), testing::Lt(1000000)));
}

TEST(RealKernelTest, FollowsAThreadWithTheNameOfAnAudioThread) {
  std::array<char, 16> name{};
  ASSERT_EQ(::pthread_getname_np(::pthread_self(), name.data(), name.size()), 0);
  ASSERT_EQ(::pthread_setname_np(::pthread_self(), "data-loop.9"), 0);
  const LinuxKernelCalls calls;
  KernelSampler sampler(calls);
  const std::array<std::int32_t, 1> self = {::getpid()};
  sampler.watch(self);
  sampler.sample();
  ::pthread_setname_np(::pthread_self(), name.data());
  const auto moments = sampler.threadMoments(::getpid(), nanoseconds(0), nanoseconds::max());
  ASSERT_THAT(moments, SizeIs(1));
  EXPECT_EQ(moments[0].tid, ::gettid());
  EXPECT_EQ(moments[0].state, 'R');
}

}  // namespace
}  // namespace tonewerk
