// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cstdint>
#include <memory>

#include "service/TWReportingServiceProtocol.h"
#include "tools/twctl/Commands.h"
#include "tools/twctl/Daemon.h"
#include "tools/twctl/SessionTable.h"
#include "tools/twctl/ValueArguments.h"

namespace tonewerk {
namespace {

void validate(Tool& tool, ReporterID reporterID) {
  Daemon daemon(tool);
  std::optional<Value> validity;
  if (!daemon.connect() || !daemon.call("reporterIDValid", {Value(reporterID)}, validity)) return;
  const ValueMap* session = validity ? validity->asMap() : nullptr;
  // 0 is the answer for an identifier that nobody has.
  if (reporterID == 0 || session == nullptr || session->integer(TWReporterProxyKeyReporterID) != reporterID) {
    tool.status = tool.fail(kRefused, "no session has the identifier " + std::to_string(reporterID));
    return;
  }
  SessionTable(tool).add(reporterID,
                         static_cast<AudioServiceType>(session->integer(TWReporterProxyKeyServiceType)));
}

}  // namespace

void addValidateCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "validate", "Whether a session has this identifier");
  const auto reporterID = std::make_shared<ReporterID>(0);
  command.add_option("ID", *reporterID, "The session's identifier")->required()->check(problemWithReporterID);
  command.callback([&tool, reporterID] { validate(tool, *reporterID); });
}

}  // namespace tonewerk
