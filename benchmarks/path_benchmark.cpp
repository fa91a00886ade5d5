// SPDX-License-Identifier: Apache-2.0
//
// Measures the way of a message through the daemon: what it costs with and without recording, how that grows
// with sessions and clients, and what remains of it. It compares with the floor, with a journal and, when
// asked, with another build of the daemon. Everything is measured in turn, in several rounds.

#include <chrono>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <getopt.h>
#include <optional>
#include <string>
#include <sys/resource.h>
#include <vector>

#include "IdleDaemons.h"
#include "PathMeasures.h"
#include "PathTable.h"

namespace tonewerk {
namespace {

constexpr const char* kUsage =
    "usage: tonewerk_path_benchmark [--quick] [--rounds N] [--idle SECONDS] [--daemon PATH] [--against "
    "PATH]\n"
    "                               [--only TEXT] [--figures FILE]\n"
    "\n"
    "  --quick          a tenth of the messages, one round, 10 s idle\n"
    "  --rounds N       how often to measure everything; medians are printed; default 5\n"
    "  --idle SECONDS   how long to watch the idle daemon; default 60, 0 for not at all\n"
    "  --daemon PATH    measure this twreportingd instead of the one that was built\n"
    "  --against PATH   also measure this twreportingd, in the same rounds\n"
    "  --only TEXT      only what has this text in its key\n"
    "  --figures FILE   append a line for each figure: key, text, now, before, aim, unit\n";

constexpr std::size_t kMaxRounds = 100;
constexpr std::size_t kQuickDivisor = 10;
constexpr double kMaxWakeUpsAnHour = 6;
constexpr double kMaxIdleMebibytes = 12;

struct Options {
  PathEffort effort;
  std::size_t rounds = 5;
  std::chrono::seconds idle{60};
  std::string daemon = TONEWERK_DAEMON;
  std::string against;
  std::string only;
  std::string figures;
};

std::optional<Options> optionsOf(int count, char** arguments) {
  static const option known[] = {
      {"quick", no_argument, nullptr, 'q'},         {"rounds", required_argument, nullptr, 'r'},
      {"idle", required_argument, nullptr, 'i'},    {"daemon", required_argument, nullptr, 'd'},
      {"against", required_argument, nullptr, 'a'}, {"only", required_argument, nullptr, 'o'},
      {"figures", required_argument, nullptr, 'f'}, {nullptr, 0, nullptr, 0}};
  Options options;
  for (int given = 0; (given = ::getopt_long(count, arguments, "", known, nullptr)) != -1;) {
    switch (given) {
      case 'q':
        options.effort.divisor = kQuickDivisor;
        options.rounds = 1;
        options.idle = std::chrono::seconds(10);
        break;
      case 'r':
        options.rounds = std::strtoul(::optarg, nullptr, 10);
        break;
      case 'i':
        options.idle = std::chrono::seconds(std::strtoul(::optarg, nullptr, 10));
        break;
      case 'd':
        options.daemon = ::optarg;
        break;
      case 'a':
        options.against = ::optarg;
        break;
      case 'o':
        options.only = ::optarg;
        break;
      case 'f':
        options.figures = ::optarg;
        break;
      default:
        return std::nullopt;
    }
  }
  if (::optind != count || options.rounds == 0 || options.rounds > kMaxRounds) return std::nullopt;
  return options;
}

// A thousand clients have a thousand sockets, in this process and in the daemon.
void allowManySockets() {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = limit.rlim_max;
  ::setrlimit(RLIMIT_NOFILE, &limit);
}

bool isWanted(const Options& options, const std::string& key) {
  return key.find(options.only) != std::string::npos;
}

void measureRound(const std::vector<PathMeasure>& measures, std::vector<PathFigure>& figures,
                  const Options& options, std::size_t round) {
  for (std::size_t at = 0; at < measures.size(); ++at) {
    const PathMeasure& measure = measures[at];
    PathFigure& figure = figures[at];
    if (!measure.problem.empty()) continue;
    std::fprintf(stderr, "%zu of %zu: %s\n", round + 1, options.rounds, measure.what.c_str());
    if (measure.reference) figure.reference.push_back(measure.reference());
    figure.now.push_back(measure.measure(options.daemon));
    if (!options.against.empty()) figure.before.push_back(measure.measure(options.against));
  }
}

void addIdle(std::vector<PathFigure>& figures, const Options& options) {
  std::vector<std::string> daemons{options.daemon};
  if (!options.against.empty()) daemons.push_back(options.against);
  std::fprintf(stderr, "idle for %lld s\n", static_cast<long long>(options.idle.count()));
  const std::vector<IdleCost> costs = measureIdle(daemons, options.idle);
  PathFigure wakeUps{"idle_wakeups_an_hour", "wake-ups of the idle daemon", "an hour", kMaxWakeUpsAnHour};
  PathFigure memory{"idle_memory_mib", "memory of the idle daemon", "MiB", kMaxIdleMebibytes};
  wakeUps.now = {costs[0].wakeUpsAnHour};
  memory.now = {costs[0].mebibytes};
  if (costs.size() > 1) {
    wakeUps.before = {costs[1].wakeUpsAnHour};
    memory.before = {costs[1].mebibytes};
  }
  figures.push_back(std::move(wakeUps));
  figures.push_back(std::move(memory));
}

int run(const Options& options) {
  std::vector<PathMeasure> measures = pathMeasures(options.effort, TONEWERK_FLOOR);
  std::erase_if(measures, [&](const PathMeasure& measure) { return !isWanted(options, measure.key); });
  std::vector<PathFigure> figures;
  figures.reserve(measures.size());
  for (const PathMeasure& measure : measures) {
    figures.push_back(
        {measure.key, measure.what, measure.unit, measure.aim, measure.isMoreBetter, measure.problem});
  }
  for (std::size_t round = 0; round < options.rounds; ++round)
    measureRound(measures, figures, options, round);
  if (options.idle.count() > 0 && isWanted(options, "idle")) addIdle(figures, options);
  printDetails(figures);
  if (options.figures.empty() || appendFigures(figures, options.figures)) return EXIT_SUCCESS;
  std::fprintf(stderr, "cannot write to %s\n", options.figures.c_str());
  return EXIT_FAILURE;
}

}  // namespace
}  // namespace tonewerk

int main(int count, char** arguments) {
  const std::optional<tonewerk::Options> options = tonewerk::optionsOf(count, arguments);
  if (!options) {
    std::fputs(tonewerk::kUsage, stderr);
    return 2;
  }
  tonewerk::allowManySockets();
  try {
    return tonewerk::run(*options);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "%s\n", error.what());
    return EXIT_FAILURE;
  }
}
