// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/TimeRangeOptions.h"

#include <CLI/CLI.hpp>
#include <chrono>

#include "tools/twctl/Tool.h"
#include "tools/twctl/input/TimeArgument.h"

namespace tonewerk {
namespace {

// Reads the time of an option; none without the option. False when it is not a time.
bool readTime(Tool& tool, const char* option, const std::optional<std::string>& text,
              std::optional<double>& time) {
  if (!text) return true;
  const double now =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  time = timeOfArgument(*text, now);
  if (time) return true;
  tool.status =
      tool.fail(kWrongUsage, std::string(option) + ": \"" + *text +
                                 "\" is neither a time, as 2026-11-20 or \"2026-11-20 10:18\", nor how "
                                 "long ago, as 10m or \"1 hour ago\"");
  return false;
}

}  // namespace

void TimeRangeOptions::addTo(CLI::App& command, const std::string& what) {
  addSinceTo(command, what);
  command.add_option("--until", until_, "Only " + what + " up to this time")->type_name("TIME");
}

void TimeRangeOptions::addSinceTo(CLI::App& command, const std::string& what) {
  command.add_option("--since", since_, "Only " + what + " from this time on")->type_name("TIME");
}

std::optional<TimeRangeOptions::Range> TimeRangeOptions::range(Tool& tool) const {
  Range range;
  if (!readTime(tool, "--since", since_, range.since)) return std::nullopt;
  if (!readTime(tool, "--until", until_, range.until)) return std::nullopt;
  if (range.since && range.until && *range.since > *range.until) {
    tool.status =
        tool.fail(kWrongUsage, "--since: \"" + *since_ + "\" is later than --until, \"" + *until_ + "\"");
    return std::nullopt;
  }
  return range;
}

}  // namespace tonewerk
