// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <thread>
#include <vector>

#include "platform/JsonService.h"
#include "platform/linux/store/StoreReader.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/MessageKeys.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"
#include "tools/twctl/show/Terminal.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr std::chrono::milliseconds kFollowInterval{200};
constexpr std::int64_t kFirstEvents = 10;  // that people see who ask for nothing

struct EventsOptions {
  EventFilterOptions filter;
  bool follow = false;
  bool isLong = false;
};

// Prints what passes the filter, and lets the filter go on behind it.
class EventPrinter {
 public:
  virtual ~EventPrinter() = default;
  [[nodiscard]] virtual bool print(StoreReader& reader, EventFilter& filter) = 0;
};

// The events for programs: one for each name of a message, with the names of the store's columns.
class EventObjects final : public EventPrinter {
 public:
  explicit EventObjects(const Tool& tool) : table_(tool, {"id", "recorded_at", "name", "payload"}) {}

  bool print(StoreReader& reader, EventFilter& filter) override {
    const bool done = reader.readEvents(filter, [&](const StoredEvent& event) {
      // The payload is JSON already.
      table_.add({Value(event.id),
                  Table::Cell::time(event.recordedAt),
                  Value(event.name),
                  {event.payload, event.payload}});
      filter.afterId = event.id;
    });
    table_.print();
    return done;
  }

 private:
  Table table_;
};

// Most names begin alike.
std::string shortName(const std::string& name) {
  constexpr std::string_view kCommon = "com.orvane.tonewerk.";
  return name.starts_with(kCommon) && name.size() > kCommon.size() ? name.substr(kCommon.size()) : name;
}

bool isError(const StoredMessage& message) {
  return message.name.ends_with(".Error") || message.name.find(".Error.") != std::string::npos;
}

// A line for each message.
class EventLines final : public EventPrinter {
 public:
  explicit EventLines(const Tool& tool)
      : json_(tool.json), width_(widthOf(tool)), table_(tool, columns(width_)) {}

  bool print(StoreReader& reader, EventFilter& filter) override {
    const bool done = reader.readMessages(filter, [&](const StoredMessage& message) {
      add(message);
      filter.afterId = message.id;
    });
    table_.print();
    return done;
  }

 private:
  static constexpr std::size_t kWide = 100;   // from here on, times and applications are whole
  static constexpr std::size_t kNarrow = 70;  // below, there is no room for the application

  static std::vector<std::string> columns(const std::optional<std::size_t>& width) {
    if (width && *width < kNarrow) return {"time", "session", "event", "what it says"};
    return {"time", "session", "application", "event", "what it says"};
  }

  bool isWide() const { return !width_ || *width_ >= kWide; }

  Table::Cell timeOf(const StoredMessage& message) const {
    Table::Cell cell = Table::Cell::time(message.recordedAt);
    constexpr std::size_t kYear = 5;
    if (!isWide()) cell.text = localSecond(message.recordedAt).substr(kYear);
    return cell;
  }

  // "Player" for "org.example.Player" where there is little room.
  std::string applicationOf(const StoredMessage& message) const {
    if (!message.application) return "-";
    const std::size_t dot = message.application->rfind('.');
    return isWide() || dot == std::string::npos ? *message.application : message.application->substr(dot + 1);
  }

  std::string keysOf(const StoredMessage& message) const {
    std::string problem;
    const std::optional<Value> payload = json_.parse(message.payload, problem);
    return payload && payload->asMap() != nullptr ? keysThatMatter(*payload->asMap()) : message.payload;
  }

  void add(const StoredMessage& message) {
    std::vector<Table::Cell> cells{timeOf(message),
                                   Value(message.session ? std::to_string(*message.session) : "-")};
    if (!width_ || *width_ >= kNarrow) cells.emplace_back(Value(applicationOf(message)));
    cells.emplace_back(Value(shortName(message.name)));
    cells.emplace_back(Value(keysOf(message)));
    for (Table::Cell& cell : cells) {
      if (isError(message)) {
        cell.style = Table::Style::kError;
      } else if (message.isDerived) {
        cell.style = Table::Style::kDim;
      }
    }
    table_.add(std::move(cells));
  }

  const JsonService& json_;
  const std::optional<std::size_t> width_;
  Table table_;
};

// A block of lines for each message, with its whole payload.
class EventBlocks final : public EventPrinter {
 public:
  explicit EventBlocks(const Tool& tool) : tool_(tool) {}

  bool print(StoreReader& reader, EventFilter& filter) override {
    const bool done = reader.readMessages(filter, [&](const StoredMessage& message) {
      add(message);
      filter.afterId = message.id;
    });
    tool_.out.flush();
    return done;
  }

 private:
  void line(const std::string& name, const std::string& text) const {
    constexpr std::size_t kNames = 12;
    tool_.out << "  " << printable(name) << std::string(name.size() < kNames ? kNames - name.size() : 1, ' ')
              << printable(text) << '\n';
  }

  void add(const StoredMessage& message) const {
    tool_.out << "event " << message.id << '\n';
    line("time", localTime(message.recordedAt));
    line("name", message.name);
    if (message.secondName) line("also", *message.secondName);
    if (message.session) {
      line("session", std::to_string(*message.session) +
                          (message.application ? ", " + *message.application : std::string()));
    }
    if (message.isDerived) line("source", "derived by the daemon");
    std::string problem;
    const std::optional<Value> payload = tool_.json.parse(message.payload, problem);
    if (!payload || payload->asMap() == nullptr) {
      line("payload", message.payload);
    } else {
      for (const ValueMap::Entry& entry : *payload->asMap())
        tool_.out << "    " << printable(entry.key.string() + "=" + entry.value.text()) << '\n';
    }
    tool_.out << '\n';
  }

  const Tool& tool_;
};

std::unique_ptr<EventPrinter> printerFor(const Tool& tool, const EventsOptions& options) {
  if (tool.asJson) return std::make_unique<EventObjects>(tool);
  if (options.isLong) return std::make_unique<EventBlocks>(tool);
  return std::make_unique<EventLines>(tool);
}

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

// False on failure, which is then printed.
bool print(Tool& tool, EventPrinter& printer, StoreReader& reader, EventFilter& filter) {
  if (printer.print(reader, filter)) return true;
  tool.status = tool.fail(kRefused, reader.problem());
  return false;
}

void printEvents(Tool& tool, EventFilter filter, const EventsOptions& options) {
  // What never ends is not for a pager.
  const auto pages = options.follow ? nullptr : std::make_unique<PagedOutput>(tool);
  const std::unique_ptr<EventPrinter> printer = printerFor(tool, options);
  StoreReader reader;
  if (!open(tool, reader, options.follow) || !print(tool, *printer, reader, filter)) return;
  filter.limit.reset();  // it is for the events that exist at the start
  while (options.follow && tool.out) {
    std::this_thread::sleep_for(kFollowInterval);
    if (reader.hasMoved()) {
      // The daemon has moved a damaged store aside and made a new one.
      if (!open(tool, reader, true)) return;
      filter.afterId = 0;
    }
    if (!print(tool, *printer, reader, filter)) return;
  }
}

}  // namespace

void addEventsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "events", "The messages in the store, a line each, newest last");
  const auto options = std::make_shared<EventsOptions>();
  using Choice = EventFilterOptions::Choice;
  options->filter.addTo(
      command, "events",
      {Choice::kName, Choice::kApplication, Choice::kDevice, Choice::kService, Choice::kSession});
  command.footer("Without -n, --since and --until, people see the newest ten, and programs (--json) all.\n" +
                 command.get_footer());
  command.add_flag("-f,--follow", options->follow,
                   "Go on with what is recorded from now on, until interrupted");
  command.add_flag("--long", options->isLong, "A block of lines for each, with everything that it says");
  command.callback([&tool, options] {
    std::optional<EventFilter> filter = options->filter.filter(tool);
    if (!filter) return;
    if (!tool.asJson && !options->filter.hasLimit() && !options->filter.hasTime())
      filter->limit = kFirstEvents;
    printEvents(tool, *filter, *options);
  });
}

}  // namespace tonewerk
