// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cstdint>
#include <memory>

#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/SessionLookup.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/SessionTable.h"

namespace tonewerk {
namespace {

void validate(Tool& tool, ReporterID reporterID) {
  DaemonCalls daemon(tool);
  std::optional<AudioServiceType> serviceType;
  if (!daemon.connect(DaemonCalls::Role::kOnlooker) || !lookUpSession(daemon, reporterID, serviceType))
    return;
  if (reporterID == 0 || !serviceType) {
    tool.status = tool.fail(kRefused, "no session has the identifier " + std::to_string(reporterID));
    return;
  }
  SessionTable(tool).add(reporterID, *serviceType);
}

}  // namespace

void addValidateCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "validate", "Whether a session has this identifier");
  const auto reporterID = std::make_shared<ReporterID>(0);
  command.add_option("ID", *reporterID, "The session's identifier")->required()->check(problemWithReporterID);
  command.callback([&tool, reporterID] { validate(tool, *reporterID); });
}

}  // namespace tonewerk
