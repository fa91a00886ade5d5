// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/TraceReaderKolvi.h"

#include <utility>

#include "platform/Kolvi.h"
#include "platform/linux/commands/BoundedCommand.h"
#include "platform/linux/tracing/lttng/CheckSignpost.h"
#include "platform/linux/tracing/lttng/TraceIntervals.h"

namespace tonewerk {
namespace {

constexpr double kSecondsPerNanosecond = 1e-9;

class IntervalModel final : public KolviModel, private KolviTimeModel {
 public:
  explicit IntervalModel(TraceIntervals intervals) : intervals_(std::move(intervals)) {}

  const KolviTimeModel& timeModel() const override { return *this; }
  double secondsFromSystemTimeDuration(std::uint64_t duration) const override {
    return static_cast<double>(duration) * kSecondsPerNanosecond;
  }

  std::vector<KolviProbe> makeProbes(const ValueArray& dictionaries) const override {
    return makeKolviProbes(dictionaries, [this](const std::string& signpost) {
      std::vector<KolviEvent> events;
      const auto found = intervals_.find(signpost);
      if (found == intervals_.end()) return events;
      events.reserve(found->second.size());
      for (const TraceInterval& interval : found->second) {
        const double begin = static_cast<double>(interval.end) - static_cast<double>(interval.duration);
        events.push_back({.timeDuration = interval.duration, .beginTime = begin * kSecondsPerNanosecond});
      }
      return events;
    });
  }

 private:
  const TraceIntervals intervals_;
};

}  // namespace

TraceReaderKolvi::TraceReaderKolvi(std::string readerPath, std::chrono::milliseconds timeout)
    : readerPath_(std::move(readerPath)), timeout_(timeout) {}

std::unique_ptr<KolviModel> TraceReaderKolvi::openModel(const std::string& traceLocation,
                                                        std::string& problem) {
  const BoundedCommand::Result result =
      BoundedCommand({readerPath_, traceLocation}, {.time = timeout_, .bytes = kMaxBytes}).run();
  // A reader that failed may have written the reason before.
  auto intervals = parseTraceIntervals(result.output, problem);
  if (!intervals && result.end != BoundedCommand::End::kExited)
    problem = "tw-trace-reader: " + result.problem;
  if (!intervals) return nullptr;
  const auto check = intervals->find(kCheckSignpost);
  const std::size_t checks = check == intervals->end() ? 0 : check->second.size();
  if (checks < kCheckSignpostsPerTrace) {
    problem = "the trace lacks its beginning or its end";
    return nullptr;
  }
  return std::make_unique<IntervalModel>(std::move(*intervals));
}

}  // namespace tonewerk
