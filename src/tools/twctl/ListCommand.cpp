// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>

#include "service/TWReportingServiceProtocol.h"
#include "tools/twctl/Commands.h"
#include "tools/twctl/Daemon.h"
#include "tools/twctl/SessionTable.h"

namespace tonewerk {
namespace {

void list(Tool& tool) {
  Daemon daemon(tool);
  std::optional<Value> reporters;
  if (!daemon.connect() || !daemon.call("getAllReporters", {}, reporters)) return;
  SessionTable table(tool);
  const ValueArray* identifiers = reporters ? reporters->asArray() : nullptr;
  if (identifiers == nullptr) return;
  for (const Value& identifier : *identifiers) {
    std::optional<Value> validity;
    if (!daemon.call("reporterIDValid", {identifier}, validity)) return;
    const ValueMap* session = validity ? validity->asMap() : nullptr;
    // One that has gone since then is left out.
    if (session == nullptr || session->integer(TWReporterProxyKeyReporterID) != identifier.integer())
      continue;
    table.add(identifier.integer(),
              static_cast<AudioServiceType>(session->integer(TWReporterProxyKeyServiceType)));
  }
}

}  // namespace

void addListCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "list", "The sessions of all clients");
  command.callback([&tool] { list(tool); });
}

}  // namespace tonewerk
