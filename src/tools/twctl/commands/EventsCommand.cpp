// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <memory>
#include <string>
#include <thread>

#include "platform/linux/store/StoreReader.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

constexpr std::chrono::milliseconds kFollowInterval{200};

struct EventsOptions {
  EventFilterOptions filter;
  bool follow = false;
};

// Prints events, and remembers the last one.
class EventPrinter {
 public:
  explicit EventPrinter(Tool& tool)
      : tool_(tool),
        table_(tool.out, tool.asJson,
               tool.asJson ? std::vector<std::string>{"id", "recorded_at", "name", "payload"}
                           : std::vector<std::string>{"id", "time", "name", "payload"}) {}

  bool print(StoreReader& reader, EventFilter& filter) {
    const bool done = reader.readEvents(filter, [&](const StoredEvent& event) {
      // The payload is JSON already.
      table_.add({Value(event.id),
                  Table::Cell::time(event.recordedAt),
                  Value(event.name),
                  {event.payload, event.payload}});
      filter.afterId = event.id;
    });
    table_.print();
    if (!done) tool_.status = tool_.fail(kRefused, reader.problem());
    return done;
  }

 private:
  Tool& tool_;
  Table table_;
};

bool open(Tool& tool, StoreReader& reader, bool waits) {
  for (;;) {
    const StoreReader::Outcome outcome = reader.open(tool.directories().state);
    if (outcome == StoreReader::Outcome::kDone) return true;
    if (outcome == StoreReader::Outcome::kFailed || !waits) {
      tool.status = tool.fail(kRefused, reader.problem());
      return false;
    }
    std::this_thread::sleep_for(kFollowInterval);
  }
}

void printEvents(Tool& tool, EventFilter filter, bool follow) {
  EventPrinter printer(tool);
  StoreReader reader;
  if (!open(tool, reader, follow) || !printer.print(reader, filter)) return;
  filter.limit.reset();  // it is for the events that exist at the start
  while (follow && tool.out) {
    std::this_thread::sleep_for(kFollowInterval);
    if (reader.hasMoved()) {
      // The daemon has moved a damaged store aside and made a new one.
      if (!open(tool, reader, true)) return;
      filter.afterId = 0;
    }
    if (!printer.print(reader, filter)) return;
  }
}

}  // namespace

void addEventsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "events", "The analytics events in the store, oldest first");
  const auto options = std::make_shared<EventsOptions>();
  options->filter.addTo(command);
  command.add_flag("--follow", options->follow, "Go on with what is recorded from now on, until interrupted");
  command.callback([&tool, options] {
    const auto filter = options->filter.filter(tool);
    if (filter) printEvents(tool, *filter, options->follow);
  });
}

}  // namespace tonewerk
