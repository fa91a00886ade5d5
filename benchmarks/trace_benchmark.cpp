// SPDX-License-Identifier: Apache-2.0
//
// Measures the cost of signposts for a program, and how long a test waits for its file after the stop. Prints
// a table.

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <string>
#include <thread>

#include "platform/Kolvi.h"
#include "platform/linux/json/JsonBenchfile.h"
#include "platform/linux/threads/SystemClock.h"
#include "platform/linux/tracing/lttng/TracingRig.h"
#include "tonewerk/signpost.h"

namespace tonewerk {
namespace {

using Clock = std::chrono::steady_clock;

constexpr char kProbes[] = R"({"name": "benchmark", "type": "interval"})";
// A burst that fits into the tracer's buffers, and a pause in which they are emptied.
constexpr std::uint64_t kBurst = 5'000;
constexpr std::chrono::milliseconds kPause{20};

double secondsSince(Clock::time_point begin) {
  return std::chrono::duration<double>(Clock::now() - begin).count();
}

// Executes `pairs` pairs, in bursts when `pauses` is true, and returns their time in seconds without the
// pauses.
double pass(std::uint64_t pairs, bool pauses) {
  double seconds = 0.0;
  for (std::uint64_t done = 0; done < pairs;) {
    const std::uint64_t end = pauses ? std::min(pairs, done + kBurst) : pairs;
    const auto begin = Clock::now();
    for (; done < end; ++done) {
      const signpost::Interval interval("benchmark", done);
    }
    seconds += secondsSince(begin);
    if (pauses) std::this_thread::sleep_for(kPause);
  }
  return seconds;
}

void printPair(const char* when, std::uint64_t pairs, bool pauses) {
  constexpr double kNanosecondsPerSecond = 1e9;
  const double seconds = pass(pairs, pauses);
  std::printf("%-45s %10.2f ns\n", when, kNanosecondsPerSecond * seconds / static_cast<double>(pairs));
}

bool writeFile(TracingRig& rig, const TraceListener& listener, std::uint64_t& count) {
  std::string problem;
  const auto model = rig.kolvi.openModel(listener.location, problem);
  if (model == nullptr) {
    std::printf("no model: %s\n", problem.c_str());
    return false;
  }
  const SystemClock clock;
  JsonBenchfile benchfile(clock);
  int systemError = 0;
  const auto writer =
      benchfile.open(rig.directory.path("data.bdj"),
                     {.dataName = "TWReporting", .resultsVersion = 4, .reporterID = 1}, systemError);
  if (writer == nullptr) return false;
  for (const KolviProbe& probe : model->makeProbes(*probeDictionariesOf(*rig.json.parse(kProbes, problem)))) {
    count += probe.events.size();
    for (const KolviEvent& event : probe.events) {
      writer->newValue(probe.name, model->timeModel().secondsFromSystemTimeDuration(event.timeDuration) * 1e3,
                       event.beginTime);
    }
  }
  return !writer->close();
}

bool printFile(TracingRig& rig, std::uint64_t intervals) {
  const auto listener = std::make_shared<TraceListener>();
  const auto session = rig.start(listener, kProbes);
  if (!listener->waitForStart() || listener->startError) {
    std::printf("no trace: %s\n", listener->startError.value_or("no answer").c_str());
    return false;
  }
  const double seconds = pass(intervals, true);
  const auto begin = Clock::now();
  session->stopRuntrace();
  if (!listener->waitForCompletion() || listener->completionError) {
    std::printf("no trace: %s\n", listener->completionError.value_or("no answer").c_str());
    return false;
  }
  const double stopped = secondsSince(begin);
  std::uint64_t count = 0;
  if (!writeFile(rig, *listener, count) || count != intervals) return false;
  std::printf("a pair, %8llu of them traced %24.2f ns\n", static_cast<unsigned long long>(intervals),
              1e9 * seconds / static_cast<double>(intervals));
  std::printf("stop to file, %8llu intervals %24.3f s, %.3f of it until the trace is complete\n",
              static_cast<unsigned long long>(intervals), secondsSince(begin), stopped);
  return true;
}

bool run() {
  constexpr std::uint64_t kManyPairs = 200'000'000;
  printPair("a pair, the library not loaded", kManyPairs, false);
  TracingRig rig;
  if (const char* problem = signpost::load(TONEWERK_SIGNPOST_LIBRARY)) {
    std::printf("no library: %s\n", problem);
    return false;
  }
  printPair("a pair, the library loaded, no trace", kManyPairs, false);
  return printFile(rig, 10'000) && printFile(rig, 1'000'000);
}

}  // namespace
}  // namespace tonewerk

int main() { return tonewerk::run() ? 0 : 1; }
