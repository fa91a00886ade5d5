// SPDX-License-Identifier: Apache-2.0
//
// Measures what it costs the bridge to follow a graph of 20 nodes with cycles of 256 frames at 48 kHz, as a
// share of a processor: the statistics alone, and with glitches found and judged, once without and once with
// eight glitches a second. The kernel is really asked. Says whether memory grew. Exits with 1 when following
// costs more than the limit.
//
//   tonewerk_glitch_benchmark [SECONDS]    default: 120, of the graph's time

#include <cstdio>
#include <cstdlib>
#include <malloc.h>
#include <time.h>
#include <unistd.h>
#include <vector>

#include "bridges/pipewire/drivers/DriverStatistics.h"
#include "bridges/pipewire/drivers/GlitchReports.h"
#include "bridges/pipewire/drivers/KernelFacts.h"
#include "bridges/pipewire/drivers/XrunWatch.h"
#include "support/manual/ManualEventLoop.h"
#include "support/memory/MemorySessionSink.h"

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using std::chrono::nanoseconds;

constexpr std::uint32_t kNodes = 20;
constexpr std::uint32_t kDriver = 36;
constexpr nanoseconds kPeriod{256 * 1'000'000'000LL / 48'000};
constexpr int kCyclesOfReport = 187;
constexpr double kLimit = 0.5;  // per cent of a processor

double processorSeconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

class Graph {
 public:
  Graph() {
    model_.complete();
    model_.nodeAppeared(kDriver, {{std::string(kMediaClassKey), "Audio/Sink"},
                                  {std::string(kNodeNameKey), "speaker"},
                                  {std::string(kNodeDriverKey), "true"}});
    for (std::uint32_t i = 1; i <= kNodes; ++i) {
      model_.clientDescribed(100 + i, {{std::string(kSocketProcessKey), std::to_string(getpid())}});
      model_.nodeAppeared(kDriver + i, {{std::string(kMediaClassKey), "Stream/Output/Audio"},
                                        {std::string(kNodeNameKey), "player " + std::to_string(i)},
                                        {std::string(kClientIDKey), std::to_string(100 + i)}});
      model_.linkAppeared(200 + i, kDriver + i, kDriver);
    }
    clock_.advance(60.0);
  }

  // The cycles of one second, in which so many are late.
  std::vector<ProfiledCycle> second(int glitches) {
    std::vector<ProfiledCycle> cycles;
    for (int i = 0; i < kCyclesOfReport; ++i) {
      ProfiledCycle cycle;
      cycle.driver = kDriver;
      cycle.number = number_++;
      cycle.position = cycle.number * 256;
      cycle.frames = 256;
      cycle.hertz = 48'000;
      cycle.period = kPeriod;
      cycle.begin = clock_.monotonic() + kPeriod * i;
      const bool isLate = glitches > 0 && i % (kCyclesOfReport / glitches) == 1;
      cycle.processing = isLate ? kPeriod + microseconds(100) : microseconds(900);
      for (std::uint32_t node = 1; node <= kNodes; ++node) {
        const nanoseconds signal = *cycle.begin + microseconds(10);
        ProfiledFollower follower{
            kDriver + node,
            true,
            std::nullopt,
            {NodeTimes::kFinished, signal, signal + microseconds(20), signal + microseconds(60)}};
        if (isLate && node == 7) {
          follower.hasFinished = false;
          follower.times = {NodeTimes::kAwake, signal, signal + microseconds(20), std::nullopt};
        }
        cycle.followers.push_back(follower);
      }
      cycles.push_back(std::move(cycle));
    }
    return cycles;
  }

  // Per cent of a processor that one way of following takes.
  template <typename Follow>
  double costOf(int seconds, int glitches, Follow follow) {
    double spent = 0;
    for (int i = 0; i < seconds; ++i) {
      const std::vector<ProfiledCycle> cycles = second(glitches);
      const double before = processorSeconds();
      follow(cycles);
      clock_.advance(1.0);  // ten samples of the kernel
      spent += processorSeconds() - before;
      for (MemorySessionSink::Session& session : sink_.sessions)
        session.messages.clear(), session.calls.clear();
    }
    return spent / seconds * 100;
  }

  void statistics(const std::vector<ProfiledCycle>& cycles) {
    for (const ProfiledCycle& cycle : cycles) statistics_.count({}, cycle, xruns_.update(cycle));
  }
  void glitches(const std::vector<ProfiledCycle>& cycles) { glitches_.profiled(cycles); }

 private:
  ManualClock clock_;
  ManualEventLoop loop_{clock_};
  MemorySessionSink sink_;
  ReporterIdentifiers identifiers_{clock_, 1};
  StreamReports streams_{sink_, clock_, identifiers_, loop_};
  GraphModel model_{streams_};
  DriverStatistics statistics_;
  XrunWatch xruns_;
  LinuxKernelCalls kernel_;
  KernelSampler sampler_{kernel_};
  KernelFacts facts_{loop_, clock_, sampler_};
  GlitchReports glitches_{model_, streams_, facts_, clock_};
  std::uint64_t number_ = 1;
};

int run(int seconds) {
  Graph graph;
  const auto statistics = [&](const std::vector<ProfiledCycle>& cycles) { graph.statistics(cycles); };
  const auto glitches = [&](const std::vector<ProfiledCycle>& cycles) { graph.glitches(cycles); };
  graph.costOf(10, 8, glitches);
  const double before = graph.costOf(seconds, 0, statistics);
  const std::size_t kept = mallinfo2().uordblks;
  const double following = graph.costOf(seconds, 0, glitches);
  const double judging = graph.costOf(seconds, 8, glitches);
  const std::size_t keptAfter = mallinfo2().uordblks;
  std::printf("\n%u nodes, cycles of 256 frames at 48 kHz, %d s; per cent of a processor\n\n", kNodes,
              seconds);
  std::printf("  statistics alone                    %8.3f\n", before);
  std::printf("  glitches, while there are none      %8.3f\n", following);
  std::printf("  glitches, eight a second            %8.3f\n", judging);
  std::printf("  limit for what is added             %8.3f   %s\n", kLimit,
              following < kLimit ? "kept" : "PASSED");
  std::printf("  memory, kB before and after         %zu, %zu\n", kept / 1024, keptAfter / 1024);
  return following < kLimit ? 0 : 1;
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  const int seconds = argc > 1 ? std::atoi(argv[1]) : 120;
  return seconds < 1 ? 2 : tonewerk::run(seconds);
}
