// SPDX-License-Identifier: Apache-2.0
//
// Measures what it costs the bridge to follow a graph of 20 nodes with cycles of 256 frames at 48 kHz, as a
// share of a processor: the statistics alone, and with glitches found and judged, once without and once with
// eight glitches a second. The kernel is really asked about 20 processes of three threads each, one of them
// PipeWire's; and, at last, about as many whose audio thread is not known. Exits with 1 when following costs
// more than the limit, or when memory grows.
//
//   tonewerk_glitch_benchmark [SECONDS]    default: 120, of the graph's time

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <malloc.h>
#include <pthread.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>
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
constexpr int kWarmUp = 70;               // seconds; the worst loads of a minute are kept
constexpr double kLimit = 0.5;            // per cent of a processor
constexpr std::size_t kMaxGrowth = 8192;  // bytes that the allocator's count may differ by

double processorSeconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

// Processes that wait, for each node one.
class AudioProcesses {
 public:
  // With a thread that PipeWire's library would have named, or without.
  explicit AudioProcesses(bool isNamed) {
    int pipe[2] = {-1, -1};
    if (::pipe(pipe) != 0) return;
    for (std::uint32_t i = 0; i < kNodes; ++i) {
      const pid_t child = ::fork();
      if (child == 0) wait(isNamed, pipe[1]);
      char byte = 0;
      if (child > 0 && ::read(pipe[0], &byte, 1) == 1) identifiers_.push_back(child);
    }
    ::close(pipe[0]);
    ::close(pipe[1]);
  }
  AudioProcesses(const AudioProcesses&) = delete;
  AudioProcesses& operator=(const AudioProcesses&) = delete;
  ~AudioProcesses() {
    for (const pid_t child : identifiers_) {
      ::kill(child, SIGKILL);
      ::waitpid(child, nullptr, 0);
    }
  }

  const std::vector<pid_t>& identifiers() const { return identifiers_; }

 private:
  [[noreturn]] static void wait(bool isNamed, int ready) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    std::thread audio([] { ::pause(); });
    std::thread other([] { ::pause(); });
    if (isNamed) ::pthread_setname_np(audio.native_handle(), "data-loop.0");
    if (::write(ready, "", 1) != 1) std::_Exit(1);
    for (;;) ::pause();
  }

  std::vector<pid_t> identifiers_;
};

class Graph {
 public:
  explicit Graph(const AudioProcesses& processes) {
    model_.complete();
    model_.nodeAppeared(kDriver, {{std::string(kMediaClassKey), "Audio/Sink"},
                                  {std::string(kNodeNameKey), "speaker"},
                                  {std::string(kNodeDriverKey), "true"}});
    for (std::uint32_t i = 1; i <= kNodes; ++i) {
      model_.clientDescribed(
          100 + i, {{std::string(kSocketProcessKey), std::to_string(processes.identifiers()[i - 1])}});
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
  const AudioProcesses named(true);
  const AudioProcesses unnamed(false);
  if (named.identifiers().size() != kNodes || unnamed.identifiers().size() != kNodes) {
    std::fprintf(stderr, "tonewerk_glitch_benchmark: cannot start the processes\n");
    return 2;
  }
  Graph graph(named);
  Graph unknown(unnamed);
  const auto statistics = [&](const std::vector<ProfiledCycle>& cycles) { graph.statistics(cycles); };
  const auto glitches = [&](const std::vector<ProfiledCycle>& cycles) { graph.glitches(cycles); };
  const auto unknownGlitches = [&](const std::vector<ProfiledCycle>& cycles) { unknown.glitches(cycles); };
  const double before = graph.costOf(seconds, 0, statistics);
  graph.costOf(kWarmUp, 8, glitches);
  unknown.costOf(kWarmUp, 8, unknownGlitches);
  const std::size_t kept = mallinfo2().uordblks;
  const double following = graph.costOf(seconds, 0, glitches);
  const double judging = graph.costOf(seconds, 8, glitches);
  const double unnamedFollowing = unknown.costOf(seconds, 0, unknownGlitches);
  const std::size_t keptAfter = mallinfo2().uordblks;
  const double most = std::max(following, unnamedFollowing);
  const bool isSmall = keptAfter <= kept + kMaxGrowth;
  std::printf("\n%u nodes, cycles of 256 frames at 48 kHz, %d s; per cent of a processor\n\n", kNodes,
              seconds);
  std::printf("  statistics alone                    %8.3f\n", before);
  std::printf("  glitches, while there are none      %8.3f\n", following);
  std::printf("  glitches, eight a second            %8.3f\n", judging);
  std::printf("  none, audio threads not known       %8.3f\n", unnamedFollowing);
  std::printf("  limit for what is added             %8.3f   %s\n", kLimit,
              most < kLimit ? "kept" : "PASSED");
  std::printf("  memory, kB before and after         %zu, %zu   %s\n", kept / 1024, keptAfter / 1024,
              isSmall ? "kept" : "GROWN");
  return most < kLimit && isSmall ? 0 : 1;
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  const int seconds = argc > 1 ? std::atoi(argv[1]) : 120;
  return seconds < 1 ? 2 : tonewerk::run(seconds);
}
