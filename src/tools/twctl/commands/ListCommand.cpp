// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>

#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/SessionLookup.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/SessionTable.h"

namespace tonewerk {
namespace {

void list(Tool& tool) {
  const PagedOutput pages(tool);
  DaemonCalls daemon(tool);
  std::optional<Value> reporters;
  if (!daemon.connect(DaemonCalls::Role::kOnlooker) ||
      !daemon.call(requests::kGetAllReporters.name, {}, reporters))
    return;
  SessionTable table(tool);
  const ValueArray* identifiers = reporters ? reporters->asArray() : nullptr;
  if (identifiers == nullptr) return;
  for (const Value& identifier : *identifiers) {
    std::optional<AudioServiceType> serviceType;
    if (!lookUpSession(daemon, identifier.integer(), serviceType)) return;
    // A session that has ended since then is left out.
    if (serviceType) table.add(identifier.integer(), *serviceType);
  }
}

}  // namespace

void addListCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "list", "The sessions that the caller may reach");
  command.callback([&tool] { list(tool); });
}

}  // namespace tonewerk
