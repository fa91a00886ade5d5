// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <optional>
#include <ostream>

#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/show/AccountTable.h"
#include "tools/twctl/show/SinkTable.h"

namespace tonewerk {
namespace {

void showSinks(Tool& tool, const ValueMap& listing) {
  const Value* found = listing.find(kWatchKeySinks);
  const ValueArray* sinks = found == nullptr ? nullptr : found->asArray();
  if (sinks == nullptr || sinks->empty()) return;
  if (!tool.asJson) tool.out << "\n";
  SinkTable table(tool);
  for (const Value& sink : *sinks) {
    if (sink.asMap() != nullptr) table.add(*sink.asMap());
  }
}

void showStatus(Tool& tool) {
  DaemonCalls daemon(tool);
  std::optional<Value> answer;
  if (!daemon.connect(DaemonCalls::Role::kOnlooker) ||
      !daemon.call(requests::kWatchAccounts.name, {}, answer))
    return;
  const ValueMap* listing = answer ? answer->asMap() : nullptr;
  const Value* found = listing == nullptr ? nullptr : listing->find(kWatchKeyAccounts);
  const ValueArray* accounts = found == nullptr ? nullptr : found->asArray();
  if (accounts == nullptr) return;
  {
    AccountTable table(tool);
    for (const Value& account : *accounts) {
      if (account.asMap() != nullptr) table.add(*account.asMap());
    }
  }
  const auto total = static_cast<std::uint64_t>(listing->integer(kWatchKeyTotal));
  if (total > accounts->size() && !tool.asJson) {
    tool.out << "and " << total - accounts->size() << " more users\n";
  }
  showSinks(tool, *listing);
}

}  // namespace

void addStatusCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "status", "What each user holds in the daemon, and how its sinks stand");
  command.footer(
      "A row for each thing that a user's clients hold: how much, the most they may hold now, and how often\n"
      "more was refused. Trusted users see all users, others themselves. Trusted users see a second table, "
      "with\n"
      "a row for each sink of reports: how much waits to be written, how much was dropped because the sink "
      "did\n"
      "not take it, and for how many seconds it has hung.");
  command.callback([&tool] { showStatus(tool); });
}

}  // namespace tonewerk
