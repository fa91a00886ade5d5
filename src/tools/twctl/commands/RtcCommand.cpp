// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <vector>

#include "platform/linux/store/StoreReader.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

using Columns = std::vector<std::string>;

bool printSessions(Tool& tool, StoreReader& reader, const EventFilter& filter) {
  Table table(tool, tool.asJson ? Columns{"id", "started_at", "session_info", "user_info"}
                                : Columns{"id", "started", "session_info", "user_info"});
  return reader.readRtcSessions(filter, [&](const StoredRtcSession& session) {
    // Both maps are JSON already.
    table.add({Value(session.id),
               Table::Cell::time(session.startedAt),
               {session.sessionInfo, session.sessionInfo},
               {session.userInfo, session.userInfo}});
  });
}

// Prints `head` before the first message.
bool printMessages(Tool& tool, StoreReader& reader, const EventFilter& filter, const std::string& head) {
  Table table(tool, tool.asJson ? Columns{"id", "sent_at", "rtc_session", "category", "type", "payload"}
                                : Columns{"id", "sent", "session", "category", "type", "payload"});
  table.dropWhenNarrow({"type", "category", "id"});
  bool isFirst = true;
  return reader.readRtcMessages(filter, [&](const StoredRtcMessage& message) {
    if (isFirst) tool.out << head;
    isFirst = false;
    table.add({Value(message.id),
               Table::Cell::time(message.sentAt),
               Value(message.session),
               Value(message.category),
               Value(message.type),
               {message.payload, message.payload}});
  });
}

void rtc(Tool& tool, const EventFilterOptions& options) {
  const auto filter = options.filter(tool);
  if (!filter) return;
  const PagedOutput pages(tool);
  StoreReader reader;
  if (reader.open(tool.directories().state) != StoreReader::Outcome::kDone ||
      !printSessions(tool, reader, *filter) ||
      !printMessages(tool, reader, *filter, tool.asJson ? "" : "\n")) {
    tool.status = tool.fail(kRefused, reader.problem());
  }
}

}  // namespace

void addRtcCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "rtc",
                 "The real-time-communication sessions in the store, and their messages, oldest first");
  const auto options = std::make_shared<EventFilterOptions>();
  using Choice = EventFilterOptions::Choice;
  options->addTo(command, "real-time-communication reports",
                 {Choice::kName, Choice::kApplication, Choice::kService});
  command.callback([&tool, options] { rtc(tool, *options); });
}

}  // namespace tonewerk
