// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <optional>
#include <ostream>
#include <string>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/health/BridgeProcesses.h"
#include "tools/twctl/health/DaemonReport.h"
#include "tools/twctl/health/StatusReport.h"
#include "tools/twctl/health/StoreBound.h"
#include "tools/twctl/health/StoreFacts.h"
#include "tools/twctl/show/Terminal.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

int showStatus(const Tool& tool) {
  StatusReport report;
  report.daemon = askDaemon(tool);
  const Directories directories = report.daemon.directoriesOr(tool.directories());
  report.store = readStoreFacts(directories.state);
  report.storeMegabytes = storeMegabytes(directories);
  report.bridges = findBridges();
  report.now = std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  report.ownVersion = TONEWERK_VERSION;
  if (tool.asJson) {
    std::string text;
    appendCompactJson(text, report.forPrograms());
    tool.out << printable(std::move(text)) << '\n';
  } else {
    report.print(tool.out, widthOf(tool));
  }
  if (!report.daemon.isConnected || report.daemon.isSilent)
    return tool.fail(kNoDaemon, report.daemon.problem);
  return report.problems().empty() ? kDone : kRefused;
}

}  // namespace

void addStatusCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "status", "How the daemon stands, its store, its sinks, and what is wrong");
  command.footer(
      "Without a command, twctl is twctl status. Exit status: 0 well; 1 something is wrong; 3 no daemon "
      "answers.\n"
      "For each user it shows what is held, the most that may be held now, and how often more was refused;\n"
      "trusted users see all users, others themselves. Only trusted users see the sinks (what waits to be\n"
      "written, what was dropped, for how long it hangs), the endpoints, and the last errors of the daemon.");
  command.callback([&tool] { tool.status = showStatus(tool); });
  app.callback([&app, &tool] {
    if (app.get_subcommands().empty()) tool.status = showStatus(tool);
  });
}

}  // namespace tonewerk
