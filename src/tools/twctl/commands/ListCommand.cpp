// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <optional>
#include <string>

#include "protocol/EventTexts.h"
#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/Pattern.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/SessionLookup.h"
#include "tools/twctl/commands/WatchedSessions.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/SessionTable.h"

namespace tonewerk {
namespace {

struct ListOptions {
  std::optional<std::string> application;
  std::optional<std::string> device;
  std::optional<std::string> service;
};

bool isOf(const std::optional<std::string>& service, AudioServiceType type) {
  return fitsPattern(service, TWReportingUtilityGenerateServiceNameFromServiceType(type));
}

// With what every user may ask.
void listReached(DaemonCalls& daemon, const std::optional<std::string>& service, SessionTable& table) {
  std::optional<Value> reporters;
  if (!daemon.call(requests::kGetAllReporters.name, {}, reporters)) return;
  const ValueArray* identifiers = reporters ? reporters->asArray() : nullptr;
  if (identifiers == nullptr) return;
  for (const Value& identifier : *identifiers) {
    std::optional<AudioServiceType> serviceType;
    if (!lookUpSession(daemon, identifier.integer(), serviceType)) return;
    // A session that has ended since then is left out.
    if (serviceType && isOf(service, *serviceType)) table.add(identifier.integer(), *serviceType);
  }
}

// With what only trusted users may ask. They reach the sessions of all clients.
void listWatched(DaemonCalls& daemon, const ListOptions& options, SessionTable& table) {
  const auto sessions = readWatchedSessions([&daemon](const Arguments& arguments) -> std::optional<Value> {
    std::optional<Value> result;
    return daemon.call(requests::kWatchSessions.name, arguments, result) ? result : std::nullopt;
  });
  if (!sessions) return;
  for (const ValueMap& session : *sessions) {
    if (session.boolean(kWatchKeySingleMessageSession)) continue;  // no client's
    const auto type = static_cast<AudioServiceType>(session.integer(kWatchKeyServiceType));
    if (isOf(options.service, type) && fitsPattern(options.application, session.text(kWatchKeyApplication)) &&
        fitsPattern(options.device, session.text(kWatchKeyDevice)))
      table.add(session.integer(kWatchKeyReporterID), type);
  }
}

void list(Tool& tool, const ListOptions& options) {
  const PagedOutput pages(tool);
  DaemonCalls daemon(tool);
  if (!daemon.connect(DaemonCalls::Role::kOnlooker)) return;
  SessionTable table(tool);
  if (options.application || options.device) {
    listWatched(daemon, options, table);
  } else {
    listReached(daemon, options.service, table);
  }
}

}  // namespace

void addListCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "list", "The sessions that the caller may reach");
  command.footer("A pattern (GLOB) may have *, ? and [...]. --app and --device are only for trusted users.");
  const auto options = std::make_shared<ListOptions>();
  command.add_option("--app", options->application, "Only those of such applications")->type_name("GLOB");
  command.add_option("--device", options->device, "Only those that named such devices last")
      ->type_name("GLOB");
  EventFilterOptions::addService(command, options->service, "Only those");
  const std::string now = "the list has the sessions of now; `twctl sessions` has those of any time";
  EventFilterOptions::refuse(command, {"--since", "--until", "-n,--limit"}, now);
  EventFilterOptions::refuse(
      command, {"--session"},
      "the daemon knows a session by its reporter's identifier; `twctl validate` looks for that");
  command.callback([&tool, options] { list(tool, *options); });
}

}  // namespace tonewerk
