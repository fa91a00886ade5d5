// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/EventFilterOptions.h"

#include <CLI/CLI.hpp>
#include <chrono>

#include "tools/twctl/Tool.h"
#include "tools/twctl/input/TimeArgument.h"
#include "tools/twctl/input/ValueArguments.h"

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
  tool.status = tool.fail(kWrongUsage, std::string(option) + ": \"" + *text +
                                           "\" is neither a time as 2026-11-20T10:18:00Z nor a span as 10m");
  return false;
}

}  // namespace

void EventFilterOptions::addTo(CLI::App& command) {
  command.add_option("--name", name_, "Only names that this pattern fits (*, ?, [...])");
  addWithoutNameTo(command);
}

void EventFilterOptions::addWithoutNameTo(CLI::App& command) {
  command.footer(
      "A time is as 2026-11-20T10:18:00Z, or how long ago: 90s, 10m, 1.5h, 2d. The store is read whether a\n"
      "daemon runs or not.");
  command.add_option("--since", since_, "Only events from this time on");
  command.add_option("--until", until_, "Only events up to this time");
  command.add_option("--limit", limit_, "Only the newest so many")->check(problemWithCount);
}

std::optional<EventFilter> EventFilterOptions::filter(Tool& tool) const {
  EventFilter filter;
  filter.name = name_;
  filter.limit = limit_;
  if (!readTime(tool, "--since", since_, filter.since)) return std::nullopt;
  if (!readTime(tool, "--until", until_, filter.until)) return std::nullopt;
  return filter;
}

}  // namespace tonewerk
