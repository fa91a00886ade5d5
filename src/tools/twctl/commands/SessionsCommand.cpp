// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/StoreSql.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/sessions/SessionsTable.h"
#include "tools/twctl/sessions/StoredSessions.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Terminal.h"

namespace tonewerk {
namespace {

struct SessionsOptions {
  SessionFilter filter;
  TimeRangeOptions range;
  std::optional<std::string> limit;
};

void sessions(Tool& tool, const SessionsOptions& options) {
  const std::optional<TimeRangeOptions::Range> range = options.range.range(tool);
  SqlReader reader;
  std::string text;
  if (!range || !openStoreSql(tool, reader, text)) return;
  const PagedOutput pages(tool);
  SessionFilter filter = options.filter;
  filter.since = range->since;
  filter.until = range->until;
  filter.limit = EventFilterOptions::limitOf(options.limit);
  const double now =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  SessionsTable table(tool.out, tool.asJson, now, widthOf(tool));
  const bool isRead =
      readSessions(reader, filter, text, [&table](const StoredSession& session) { table.add(session); });
  if (!isRead) tool.status = tool.fail(kRefused, text);
}

}  // namespace

void addSessionsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "sessions", "The sessions in the store, the newest last");
  command.footer(
      "A narrow terminal gets fewer columns. A pattern (GLOB) may have *, ? and [...].\n" +
      std::string(TimeRangeOptions::kForms) +
      "\n`twctl session ID` tells what happened in one. The store is read whether a daemon runs or not.");
  const auto options = std::make_shared<SessionsOptions>();
  options->range.addTo(command, "sessions that ran");
  EventFilterOptions::addLimit(command, options->limit);
  command.add_option("--app", options->filter.application, "Only those of such applications")
      ->type_name("GLOB");
  command
      .add_option("--device", options->filter.device, "Only those that played or recorded on such devices")
      ->type_name("GLOB");
  EventFilterOptions::addService(command, options->filter.service, "Only those");
  command.add_option("--session", options->filter.session, "Only the one of this id")
      ->type_name("ID")
      ->check(problemWithCount);
  command.callback([&tool, options] { sessions(tool, *options); });
}

}  // namespace tonewerk
