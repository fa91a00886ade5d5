// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <limits>
#include <memory>
#include <string>
#include <thread>

#include "platform/linux/StoreReader.h"
#include "tools/twctl/Commands.h"
#include "tools/twctl/Table.h"
#include "tools/twctl/TimeArgument.h"

namespace tonewerk {
namespace {

constexpr std::chrono::milliseconds kFollowInterval{200};

struct EventsOptions {
  std::optional<std::string> name;
  std::optional<std::string> since;
  std::optional<std::string> until;
  std::optional<std::int64_t> limit;
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
      // The payload is JSON as it is.
      table_.add(
          {Value(event.id), timeCell(event.recordedAt), Value(event.name), {event.payload, event.payload}});
      filter.afterId = event.id;
    });
    table_.print();
    if (!done) tool_.status = tool_.fail(kRefused, reader.problem());
    return done;
  }

 private:
  static Table::Cell timeCell(double seconds) {
    return {textOf(Date{seconds}), Table::Cell(Value(seconds)).json};
  }

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
  filter.limit.reset();  // of what was there at the beginning
  while (follow && tool.out) {
    std::this_thread::sleep_for(kFollowInterval);
    if (reader.hasMoved()) {
      // A damaged store was moved aside, and a new one begun.
      if (!open(tool, reader, true)) return;
      filter.afterId = 0;
    }
    if (!printer.print(reader, filter)) return;
  }
}

// The time that an option says; none without the option. False when it says none.
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

void events(Tool& tool, const EventsOptions& options) {
  EventFilter filter;
  filter.name = options.name;
  filter.limit = options.limit;
  if (!readTime(tool, "--since", options.since, filter.since)) return;
  if (!readTime(tool, "--until", options.until, filter.until)) return;
  printEvents(tool, filter, options.follow);
}

}  // namespace

void addEventsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "events", "The analytics events in the store, oldest first");
  command.footer(
      "A time is as 2026-11-20T10:18:00Z, or how long ago: 90s, 10m, 1.5h, 2d. The store is read whether a\n"
      "daemon runs or not.");
  const auto options = std::make_shared<EventsOptions>();
  command.add_option("--name", options->name, "Only names that this pattern fits (*, ?, [...])");
  command.add_option("--since", options->since, "Only events from this time on");
  command.add_option("--until", options->until, "Only events up to this time");
  command.add_option("--limit", options->limit, "Only the newest so many")
      ->check(CLI::Range(std::int64_t{1}, std::numeric_limits<std::int64_t>::max()));
  command.add_flag("--follow", options->follow, "Go on with what is recorded from now on, until interrupted");
  command.callback([&tool, options] { events(tool, *options); });
}

}  // namespace tonewerk
