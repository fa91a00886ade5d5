// SPDX-License-Identifier: Apache-2.0
//
// Measures the cost of a message for the daemon end to end, through its socket, and compares it with the
// floor: a server that decodes the same bytes and discards them. Both are measured alternately in the same
// run, and compared by processor time.
//
//   tonewerk_ingest_benchmark [REPETITIONS [SCENARIO]]
//
// SCENARIO: run only the scenarios whose name contains this text.

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <string_view>
#include <vector>

#include "IngestRun.h"

namespace tonewerk {
namespace {

using Kind = IngestMessages::Kind;

constexpr std::size_t kDefaultRepetitions = 3;
constexpr std::size_t kMaxRepetitions = 100;
constexpr std::size_t kWindow = 256;
constexpr std::size_t kMessages = 65'536;
constexpr std::size_t kFewMessages = 16'384;
constexpr std::size_t kBatch = 128;
constexpr double kAim = 4.0;
constexpr double kMebibyte = 1 << 20;

const std::vector<IngestScenario>& scenarios() {
  constexpr Kind kChanging = Kind::kChanging;
  constexpr Kind kRedundant = Kind::kRepeated;
  static const std::vector<IngestScenario> all{
      {"1 client, changing, each awaited", 1, kChanging, 1, 1, kFewMessages, 0},
      {"1 client, redundant, each awaited", 1, kRedundant, 1, 1, kFewMessages, 0},
      {"8 clients, changing, each awaited", 8, kChanging, 1, 1, kFewMessages, 0},
      {"1 client, changing", 1, kChanging, kWindow, 1, kMessages, 0},
      {"1 client, changing, 100000 stored", 1, kChanging, kWindow, 1, kMessages, 100'000},
      {"1 client, redundant", 1, kRedundant, kWindow, 1, kMessages, 0},
      {"8 clients, changing", 8, kChanging, kWindow, 1, kMessages, 0},
      {"8 clients, redundant", 8, kRedundant, kWindow, 1, kMessages, 0},
      {"1 client, changing, 128 a write", 1, kChanging, kWindow, kBatch, kMessages, 0},
      {"1 client, redundant, 128 a write", 1, kRedundant, kWindow, kBatch, kMessages, 0},
      {"1 client, changing, call records", 1, kChanging, kWindow, 1, kMessages, 0, true},
  };
  return all;
}

struct Measured {
  IngestScenario scenario;
  std::vector<IngestCost> daemon;
  std::vector<IngestCost> floor;
};

// Returns the median by processor time.
const IngestCost& median(std::vector<IngestCost>& costs) {
  const auto middle = costs.begin() + static_cast<std::ptrdiff_t>(costs.size() / 2);
  std::nth_element(costs.begin(), middle, costs.end(), [](const IngestCost& a, const IngestCost& b) {
    return a.processorTime < b.processorTime;
  });
  return *middle;
}

void printCosts(std::vector<Measured>& all) {
  std::printf("\nProcessor time a message, in microseconds; aim: a ratio of at most %.0f\n\n", kAim);
  std::printf("%-36s %8s %8s %6s %12s %12s %11s %11s\n", "", "daemon", "floor", "ratio", "daemon msg/s",
              "floor msg/s", "daemon MiB", "floor MiB");
  for (Measured& measured : all) {
    const IngestCost& daemon = median(measured.daemon);
    const IngestCost& floor = median(measured.floor);
    std::printf("%-36s %8.2f %8.2f %6.2f %12.0f %12.0f %11.1f %11.1f\n", measured.scenario.name.c_str(),
                daemon.processorTime.count(), floor.processorTime.count(),
                daemon.processorTime / floor.processorTime, daemon.messagesPerSecond, floor.messagesPerSecond,
                static_cast<double>(daemon.peakMemory) / kMebibyte,
                static_cast<double>(floor.peakMemory) / kMebibyte);
  }
}

void printThreads(std::vector<Measured>& all) {
  std::printf("\nWhere the daemon spends it, in microseconds a message; the stop's is beside it\n\n");
  for (Measured& measured : all) {
    const IngestCost& daemon = median(measured.daemon);
    std::printf("%-36s", measured.scenario.name.c_str());
    for (const auto& [name, time] : daemon.threads) {
      if (time.count() >= 0.005) std::printf("  %s %.2f", name.c_str(), time.count());
    }
    std::printf("  at stop %.2f\n", daemon.stopTime.count());
  }
}

int run(std::size_t repetitions, std::string_view wanted) {
  std::vector<Measured> all;
  for (const IngestScenario& scenario : scenarios()) {
    if (scenario.name.find(wanted) != std::string::npos) all.push_back({scenario, {}, {}});
  }
  for (std::size_t repetition = 0; repetition < repetitions; ++repetition) {
    for (Measured& measured : all) {
      std::fprintf(stderr, "%zu of %zu: %s\n", repetition + 1, repetitions, measured.scenario.name.c_str());
      measured.floor.push_back(measureIngest(measured.scenario, IngestServer::kFloor));
      measured.daemon.push_back(measureIngest(measured.scenario, IngestServer::kDaemon));
    }
  }
  printCosts(all);
  printThreads(all);
  return EXIT_SUCCESS;
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  const std::size_t repetitions =
      argc > 1 ? std::strtoul(argv[1], nullptr, 10) : tonewerk::kDefaultRepetitions;
  if (argc > 3 || repetitions == 0 || repetitions > tonewerk::kMaxRepetitions) {
    std::fprintf(stderr, "usage: tonewerk_ingest_benchmark [REPETITIONS [SCENARIO]]\n");
    return 2;
  }
  try {
    return tonewerk::run(repetitions, argc > 2 ? argv[2] : "");
  } catch (const std::exception& error) {
    std::fprintf(stderr, "%s\n", error.what());
    return EXIT_FAILURE;
  }
}
