// SPDX-License-Identifier: Apache-2.0
//
// Measures the driver statistics of a session: the snapshot of 10,000 published channels at its start and
// their report at its stop. Compares them with reading the same sources without using them, and with a limit.
// Every file changes before each reading. Exits with 1 when the limit is exceeded.
//
//   tonewerk_driver_statistics_benchmark [REPETITIONS]    default: 11; medians are printed

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <time.h>
#include <vector>

#include "PublishedDrivers.h"
#include "driver/TWReportingDriverUtility.h"
#include "platform/Log.h"
#include "platform/linux/LinuxPlatform.h"
#include "platform/linux/channels/LinuxChanmeter.h"
#include "platform/linux/directories/Directories.h"
#include "platform/linux/tracing/UnavailableTracing.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryJournal.h"
#include "support/memory/reports/MemoryDiagwire.h"
#include "support/memory/reports/MemoryEnergybook.h"
#include "support/memory/reports/MemoryLinkReport.h"
#include "support/memory/reports/MemoryMetricon.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

constexpr std::size_t kDrivers = 10;
constexpr std::size_t kChannelsOfEach = 1000;
constexpr double kMaxMilliseconds = 100;

double processorMilliseconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) * 1e3 + static_cast<double>(now.tv_nsec) / 1e6;
}

double costOf(const std::function<void()>& work) {
  const double before = processorMilliseconds();
  work();
  return processorMilliseconds() - before;
}

double medianOf(std::vector<double> costs) {
  std::sort(costs.begin(), costs.end());
  return costs[costs.size() / 2];
}

[[noreturn]] void fail(const char* what) {
  std::fprintf(stderr, "%s\n", what);
  std::exit(2);
}

// Subscribes to all channels of a directory.
class AllChannels {
 public:
  AllChannels(const std::string& directory, const LogCategory& log) : chanmeter_(directory, log) {
    const auto channels = chanmeter_.copyChannelsInGroup({}, {}, error_);
    subscription_ = chanmeter_.createSubscription(channels, subscribed_, error_);
  }

  void read() {
    if (chanmeter_.createSamples(subscription_, subscribed_, error_) == nullptr || error_)
      fail("cannot read");
  }

 private:
  LinuxChanmeter chanmeter_;
  Chanmeter::Subscription subscription_;
  Chanmeter::Channels subscribed_;
  std::optional<ChanmeterError> error_;
};

// Costs in milliseconds. A session reads the channels twice, and `files` and `sources` are for two readings
// too.
struct Costs {
  std::vector<double> files;
  std::vector<double> sources;
  std::vector<double> snapshot;
  std::vector<double> report;
  std::vector<double> both;
};

class Benchmark {
 public:
  Benchmark() {
    std::filesystem::create_directory(channelsDirectory_);
    drivers_.publishNextValues();
    utility_ = &context_.singletons().get<TWReportingDriverUtility>();  // the one that all sessions share
    all_.emplace(channelsDirectory_, log_);
  }

  void repeat() {
    drivers_.publishNextValues();
    double files = costOf([&] { readFiles(); });
    double sources = costOf([&] { all_->read(); });
    TWReportingDriverUtility::Snapshot snapshot;
    const double first = costOf([&] { snapshot = utility_->getSnapShot(); });

    const auto session = TWReportingSession::initWithID(77, {4711});
    session->setServiceType(kServiceTest);
    session->start();

    drivers_.publishNextValues();
    files += costOf([&] { readFiles(); });
    sources += costOf([&] { all_->read(); });
    const double second = costOf([&] { utility_->sendDriverLogsForSession(session.get(), &snapshot); });
    check(*session);

    costs_.files.push_back(files);
    costs_.sources.push_back(sources);
    costs_.snapshot.push_back(first);
    costs_.report.push_back(second);
    costs_.both.push_back(first + second);
    metricon_.clear();
  }

  bool print() const {
    const double both = medianOf(costs_.both);
    std::printf(
        "\n%zu channels of %zu drivers, %.1f MB, all changed before each reading; ms of processor time\n\n",
        drivers_.channels(), kDrivers, static_cast<double>(drivers_.bytes()) / 1e6);
    std::printf("  reading the files, twice        %8.1f\n", medianOf(costs_.files));
    std::printf("  reading the sources, twice      %8.1f\n", medianOf(costs_.sources));
    std::printf("  snapshot                        %8.1f\n", medianOf(costs_.snapshot));
    std::printf("  report                          %8.1f\n", medianOf(costs_.report));
    std::printf("  snapshot and report             %8.1f\n", both);
    std::printf("  limit                           %8.1f   %s\n", kMaxMilliseconds,
                both < kMaxMilliseconds ? "kept" : "PASSED");
    return both < kMaxMilliseconds;
  }

 private:
  void readFiles() const {
    if (drivers_.readFiles() != drivers_.bytes()) fail("files are not whole");
  }

  // Every channel changes before each reading, so the report must contain all of them.
  void check(const TWReportingSession& session) const {
    std::size_t entries = 0;
    std::size_t messages = 0;
    for (const auto& record : session.messages()) {
      if (record->category != kCategoryChanmetering) continue;
      ++messages;
      for (const auto& entry : record->message) {
        if (entry.key.view().starts_with("Driver")) ++entries;
      }
    }
    if (messages != 3 || entries != drivers_.channels()) fail("the report is not whole");
  }

  TemporaryDirectory directory_;
  const std::string channelsDirectory_ = directory_.path("channels");
  PublishedDrivers drivers_{channelsDirectory_, kDrivers, kChannelsOfEach};
  // The daemon's own adapters, except the sinks.
  LinuxPlatform linux_{{.runtime = directory_.path(),
                        .state = directory_.path("state"),
                        .logs = directory_.path("logs"),
                        .configuration = directory_.path("configuration")}};
  const LogCategory log_{linux_.log(), "com.orvane.tonewerk", "twrs"};
  MemoryMetricon metricon_;
  MemoryEnergybook energybook_;
  MemoryDiagwire diagwire_;
  MemoryLinkReport linkReport_;
  const Tracing tracing_ = makeUnavailableTracing("not measured");
  MemoryJournal journal_;
  TWReportingContext context_{
      linux_.platform(linux_.clock(), metricon_, energybook_, diagwire_, linkReport_, tracing_, journal_),
      allWorkerClasses()};
  const TWReportingDriverUtility* utility_ = nullptr;
  std::optional<AllChannels> all_;
  Costs costs_;
};

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  const int repetitions = argc > 1 ? std::atoi(argv[1]) : 11;
  if (repetitions < 1) return 2;
  tonewerk::Benchmark benchmark;
  for (int repetition = 0; repetition < repetitions; ++repetition) benchmark.repeat();
  return benchmark.print() ? 0 : 1;
}
