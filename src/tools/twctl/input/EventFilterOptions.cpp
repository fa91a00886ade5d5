// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/EventFilterOptions.h"

#include <CLI/CLI.hpp>

#include "tools/twctl/Tool.h"
#include "tools/twctl/input/ValueArguments.h"

namespace tonewerk {

void EventFilterOptions::addTo(CLI::App& command) {
  command.add_option("--name", name_, "Only names that this pattern fits (*, ?, [...])");
  addWithoutNameTo(command);
}

void EventFilterOptions::addWithoutNameTo(CLI::App& command) {
  command.footer(std::string(TimeRangeOptions::kForms) + "\nThe store is read whether a daemon runs or not.");
  range_.addTo(command, "events");
  command.add_option("--limit", limit_, "Only the newest so many")->check(problemWithCount);
}

std::optional<EventFilter> EventFilterOptions::filter(Tool& tool) const {
  const std::optional<TimeRangeOptions::Range> range = range_.range(tool);
  if (!range) return std::nullopt;
  EventFilter filter;
  filter.name = name_;
  filter.limit = limit_;
  filter.since = range->since;
  filter.until = range->until;
  return filter;
}

}  // namespace tonewerk
