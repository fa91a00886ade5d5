// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <optional>
#include <ostream>
#include <string>

#include "platform/linux/directories/Directories.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/health/Checkup.h"
#include "tools/twctl/health/StoreBound.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"
#include "tools/twctl/show/Terminal.h"
#include "tools/twctl/show/WrappedLines.h"

namespace tonewerk {
namespace {

constexpr std::size_t kLabelWidth = 6;  // "remedy"

WrappedLines linesFor(const Tool& tool) { return {tool.out, kLabelWidth, widthOf(tool)}; }

Checkup makeCheckup(const Tool& tool) {
  Checkup checkup;
  checkup.around = linuxSurroundings();
  checkup.ownVersion = TONEWERK_VERSION;
  checkup.sockets = tool.socketPaths();
  checkup.daemon = askDaemon(tool);
  checkup.directories = checkup.daemon.directoriesOr(tool.directories());
  checkup.isSystemWide = tool.systemWide || checkup.directories.state == Directories::system().state;
  checkup.store = readStoreFacts(checkup.directories.state);
  checkup.storeMegabytes = storeMegabytes(checkup.directories);
  return checkup;
}

void showToPrograms(const Tool& tool, const Findings& findings) {
  {
    Table table(tool.out, true, {"finding", "what", "why", "remedy"});
    for (const Finding& finding : findings.all())
      table.add(
          {Value(finding.kind->name), Value(finding.what), Value(finding.kind->why), Value(finding.remedy)});
  }
  Table table(tool.out, true, {"unseen"});
  for (const std::string& what : findings.unseen()) table.add({Value(what)});
}

void showToPeople(const Tool& tool, const Findings& findings) {
  WrappedLines lines = linesFor(tool);
  for (const Finding& finding : findings.all()) {
    tool.out << finding.kind->name << '\n';
    lines.add("what", finding.what);
    lines.add("why", std::string(finding.kind->why));
    lines.add("remedy", finding.remedy);
    tool.out << '\n';
  }
  for (const std::string& what : findings.unseen()) lines.add("unseen", what);
  const std::size_t count = findings.all().size();
  if (count == 0) {
    tool.out << (findings.unseen().empty() ? "nothing is wrong\n" : "nothing is wrong that you can see\n");
  } else {
    tool.out << count << (count == 1 ? " finding\n" : " findings\n");
  }
}

// Prints what there is to find, for people and for the page that explains it.
void listKinds(const Tool& tool) {
  const PagedOutput pages(tool);
  if (tool.asJson) {
    Table table(tool.out, true, {"finding", "cause", "why", "remedy"});
    for (const FindingKind& kind : findingKinds())
      table.add({Value(kind.name), Value(kind.cause), Value(kind.why), Value(kind.remedy)});
    return;
  }
  WrappedLines lines = linesFor(tool);
  for (const FindingKind& kind : findingKinds()) {
    tool.out << kind.name << '\n';
    lines.add("what", std::string(kind.cause));
    lines.add("why", std::string(kind.why));
    lines.add("remedy", std::string(kind.remedy));
  }
}

int examine(const Tool& tool) {
  const PagedOutput pages(tool);
  const Checkup checkup = makeCheckup(tool);
  const Findings findings = checkAll(checkup);
  if (tool.asJson) {
    showToPrograms(tool, findings);
  } else {
    showToPeople(tool, findings);
  }
  if (!checkup.daemon.isConnected || checkup.daemon.isSilent) return kNoDaemon;
  return findings.all().empty() ? kDone : kRefused;
}

}  // namespace

void addDoctorCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "doctor", "Looks for what is wrong, and says what to do about it");
  command.footer(
      "Checks the socket, the daemon, owners and permissions, units, the bridge, preferences and facts,\n"
      "endpoints (a connection is made to each and closed), the clock, the store and its disk. It changes\n"
      "nothing, and says what the caller may not see.\n"
      "Exit status: 0 nothing is wrong; 1 something is; 3 no daemon answers, and the rest was checked.");
  const auto lists = std::make_shared<bool>(false);
  command.add_flag("--list", *lists, "Lists what there is to find, and checks nothing");
  command.callback([&tool, lists] {
    if (*lists) return listKinds(tool);
    tool.status = examine(tool);
  });
}

}  // namespace tonewerk
