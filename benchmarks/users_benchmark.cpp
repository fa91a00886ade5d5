// SPDX-License-Identifier: Apache-2.0
//
// Measures how long one user's quiet client waits for its answers while another user keeps the daemon busy,
// in several ways, and compares with another build of the daemon when asked.

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <getopt.h>
#include <optional>
#include <string>
#include <sys/resource.h>
#include <unistd.h>
#include <vector>

#include "UserScenes.h"
#include "support/users/RoundTripProbe.h"

namespace tonewerk {
namespace {

constexpr const char* kUsage =
    "usage: tonewerk_users_benchmark [--rounds N] [--seconds N] [--daemon PATH] [--against PATH] [--only "
    "TEXT]\n"
    "\n"
    "  --rounds N       how often to measure everything; all answers count together; default 3\n"
    "  --seconds N      how long the quiet client asks each time; default 4\n"
    "  --daemon PATH    measure this twreportingd instead of the one that was built\n"
    "  --against PATH   also measure this twreportingd, in the same rounds\n"
    "  --only TEXT      only beside what has this text in its name\n"
    "\n"
    "Only root can run it, because the clients become other users.\n";

constexpr unsigned long kMaxRounds = 100;
constexpr unsigned long kMaxSeconds = 600;

struct Options {
  unsigned long rounds = 3;
  unsigned long seconds = 4;
  std::vector<std::string> daemons{TONEWERK_DAEMON};
  std::string only;
};

std::optional<Options> optionsOf(int count, char** arguments) {
  static const option known[] = {
      {"rounds", required_argument, nullptr, 'r'}, {"seconds", required_argument, nullptr, 's'},
      {"daemon", required_argument, nullptr, 'd'}, {"against", required_argument, nullptr, 'a'},
      {"only", required_argument, nullptr, 'o'},   {nullptr, 0, nullptr, 0}};
  Options options;
  for (int given = 0; (given = ::getopt_long(count, arguments, "", known, nullptr)) != -1;) {
    switch (given) {
      case 'r':
        options.rounds = std::strtoul(::optarg, nullptr, 10);
        break;
      case 's':
        options.seconds = std::strtoul(::optarg, nullptr, 10);
        break;
      case 'd':
        options.daemons.front() = ::optarg;
        break;
      case 'a':
        options.daemons.resize(1);
        options.daemons.emplace_back(::optarg);
        break;
      case 'o':
        options.only = ::optarg;
        break;
      default:
        return std::nullopt;
    }
  }
  const bool isRight = ::optind == count && options.rounds > 0 && options.rounds <= kMaxRounds &&
                       options.seconds > 0 && options.seconds <= kMaxSeconds;
  return isRight ? std::optional(options) : std::nullopt;
}

void print(const std::string& what, const char* daemon, std::vector<std::chrono::nanoseconds> measured) {
  const RoundTripTimes times(std::move(measured));
  std::printf("| %-34s | %-6s |", what.c_str(), daemon);
  for (const double share : {0.5, 0.9, 0.99, 0.999, 1.0}) {
    std::printf(" %9.3f |", times.millisecondsWithin(share));
  }
  std::printf(" %7zu |\n", times.count());
}

int run(const Options& options) {
  std::vector<UserScene> scenes = userScenes();
  std::erase_if(scenes,
                [&](const auto& scene) { return scene.what.find(options.only) == std::string::npos; });
  // For each scene and each daemon.
  std::vector<std::vector<std::vector<std::chrono::nanoseconds>>> times(
      scenes.size(), std::vector<std::vector<std::chrono::nanoseconds>>(options.daemons.size()));
  for (unsigned long round = 0; round < options.rounds; ++round) {
    for (std::size_t scene = 0; scene < scenes.size(); ++scene) {
      std::fprintf(stderr, "%lu of %lu: beside %s\n", round + 1, options.rounds, scenes[scene].what.c_str());
      for (std::size_t daemon = 0; daemon < options.daemons.size(); ++daemon) {
        const auto measured =
            measureBeside(scenes[scene], options.daemons[daemon], std::chrono::seconds(options.seconds));
        times[scene][daemon].insert(times[scene][daemon].end(), measured.begin(), measured.end());
      }
    }
  }
  std::printf("milliseconds until an answer, beside another user who sends\n\n");
  std::printf("| %-34s | %-6s | %9s | %9s | %9s | %9s | %9s | %7s |\n", "", "daemon", "50 %", "90 %", "99 %",
              "99.9 %", "most", "answers");
  std::printf("|---|---|--:|--:|--:|--:|--:|--:|\n");
  for (std::size_t scene = 0; scene < scenes.size(); ++scene) {
    for (std::size_t daemon = 0; daemon < options.daemons.size(); ++daemon) {
      print(scenes[scene].what, daemon == 0 ? "now" : "before", std::move(times[scene][daemon]));
    }
  }
  return EXIT_SUCCESS;
}

// A hundred connections have a hundred sockets, and the daemon's limit is that of this process.
void allowManySockets() {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = limit.rlim_max;
  ::setrlimit(RLIMIT_NOFILE, &limit);
}

}  // namespace
}  // namespace tonewerk

int main(int count, char** arguments) {
  const std::optional<tonewerk::Options> options = tonewerk::optionsOf(count, arguments);
  if (!options) {
    std::fputs(tonewerk::kUsage, stderr);
    return 2;
  }
  if (::geteuid() != 0) {
    std::fputs("only root can become other users\n", stderr);
    return EXIT_FAILURE;
  }
  tonewerk::allowManySockets();
  ::setenv("TONEWERK_LOG", "error", 1);  // otherwise each question would have a line in the log
  try {
    return tonewerk::run(*options);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "%s\n", error.what());
    return EXIT_FAILURE;
  }
}
