// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "platform/linux/store/StoreReader.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

struct PowerOptions {
  EventFilterOptions filter;
  bool totalsOnly = false;
};

bool printEvents(Tool& tool, StoreReader& reader, const EventFilter& filter) {
  Table table(tool, tool.asJson
                        ? std::vector<std::string>{"id", "recorded_at", "event_group", "name", "payload"}
                        : std::vector<std::string>{"id", "time", "group", "name", "payload"});
  table.dropWhenNarrow({"group", "id"});
  return reader.readPowerEvents(filter, [&](const StoredPowerEvent& event) {
    // The payload is JSON already.
    table.add({Value(event.id),
               Table::Cell::time(event.recordedAt),
               Value(event.group),
               Value(event.name),
               {event.payload, event.payload}});
  });
}

Table::Cell applicationCell(const EngineOnTotal& total) {
  if (!total.application) return {"(null)", "null"};
  return Value(*total.application);
}

// Prints `head` before the first total.
bool printTotals(Tool& tool, StoreReader& reader, const EventFilter& filter, const std::string& head) {
  Table table(tool, {"ApplicationName", "EngineOnDuration", "events"});
  bool isFirst = true;
  return reader.readEngineOnTotals(filter, [&](const EngineOnTotal& total) {
    if (isFirst) tool.out << head;
    isFirst = false;
    table.add({applicationCell(total), Value(total.duration), Value(total.events)});
  });
}

// For programs, all lines are of the same kind.
bool print(Tool& tool, StoreReader& reader, const EventFilter& filter, bool totalsOnly) {
  if (totalsOnly) return printTotals(tool, reader, filter, "");
  return printEvents(tool, reader, filter) && (tool.asJson || printTotals(tool, reader, filter, "\n"));
}

void power(Tool& tool, const PowerOptions& options) {
  const auto filter = options.filter.filter(tool);
  if (!filter) return;
  const PagedOutput pages(tool);
  StoreReader reader;
  if (reader.open(tool.directories().state) != StoreReader::Outcome::kDone ||
      !print(tool, reader, *filter, options.totalsOnly)) {
    tool.status = tool.fail(kRefused, reader.problem());
  }
}

}  // namespace

void addPowerCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "power",
                                 "The power events in the store, oldest first, and for how long each "
                                 "application had the haptics engine on");
  const auto options = std::make_shared<PowerOptions>();
  using Choice = EventFilterOptions::Choice;
  options->filter.addTo(command, "power events", {Choice::kName, Choice::kApplication});
  command.add_flag("--totals", options->totalsOnly, "Only for how long the engine was on, by application");
  command.callback([&tool, options] { power(tool, *options); });
}

}  // namespace tonewerk
