// SPDX-License-Identifier: Apache-2.0
#include "tools/memory-usage/MemoryUsageCommand.h"

#include <CLI/CLI.hpp>
#include <limits>
#include <map>
#include <ostream>
#include <string>
#include <unistd.h>

#include "tools/memory-usage/ProcReader.h"
#include "tools/memory-usage/UsageReport.h"

namespace tonewerk {
namespace {

constexpr int kDone = 0;
constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;

const char* const kExplanation =
    "Each process, all processes and the whole system have four lines, each a total of two parts, and what\n"
    "it mostly is:\n"
    "  cpu_time        seconds of processor time: user, system\n"
    "  phys_mem        KiB of resident memory: its own (anonymous), of files or shared with others\n"
    "  wired_mem       KiB that are never swapped: locked, pinned for devices (of the system: the kernel's)\n"
    "  phys_footprint  KiB of its own memory: resident, swapped\n"
    "Threads of the kernel have no memory of their own and are left out.\n"
    "\n"
    "Exit status: 0 done; 1 nothing could be read or written; 2 wrong usage.";

const std::map<std::string, UsageOrder> kOrders{{"footprint", UsageOrder::kFootprint},
                                                {"resident", UsageOrder::kResident},
                                                {"wired", UsageOrder::kWired},
                                                {"cpu", UsageOrder::kProcessorTime},
                                                {"pid", UsageOrder::kProcess}};

struct Options {
  std::string procDirectory = "/proc";
  std::string order = "footprint";
  std::size_t most = std::numeric_limits<std::size_t>::max();
  bool asJson = false;
};

void addOptions(CLI::App& app, Options& options) {
  app.set_version_flag("--version", std::string("tw-memory-usage ") + TONEWERK_VERSION);
  app.footer(kExplanation);
  app.add_option("--sort", options.order, "Largest first by this, or by process number")
      ->check(CLI::IsMember(kOrders))
      ->capture_default_str();
  app.add_option("--top", options.most, "Only so many processes; the totals are of all")
      ->check(CLI::NonNegativeNumber)
      ->type_name("N");
  app.add_flag("--json", options.asJson, "One JSON object a line");
  app.add_option("--proc", options.procDirectory, "Look there")
      ->type_name("DIRECTORY")
      ->capture_default_str();
}

int fail(std::ostream& err, const std::string& problem) {
  err << "tw-memory-usage: " << problem << '\n';
  return kFailed;
}

int report(const Options& options, std::ostream& out, std::ostream& err) {
  const ProcReader reader(options.procDirectory, static_cast<double>(sysconf(_SC_CLK_TCK)));
  std::string problem;
  auto snapshot = reader.read(problem);
  if (!snapshot) return fail(err, problem);
  sortProcesses(snapshot->processes, kOrders.at(options.order));
  if (options.asJson) {
    writeUsageJson(out, *snapshot, options.most);
  } else {
    writeUsageText(out, *snapshot, options.most);
  }
  out.flush();
  return out ? kDone : fail(err, "cannot write the report");
}

}  // namespace

int runMemoryUsage(int argc, const char* const* argv, std::ostream& out, std::ostream& err) {
  CLI::App app("Prints what each process takes of the device's memory.", "tw-memory-usage");
  Options options;
  addOptions(app, options);
  try {
    app.parse(argc, argv);
    return report(options, out, err);
  } catch (const CLI::ParseError& error) {
    return app.exit(error, out, err) == 0 ? kDone : kWrongUsage;
  } catch (const std::exception& error) {
    return fail(err, error.what());
  }
}

}  // namespace tonewerk
