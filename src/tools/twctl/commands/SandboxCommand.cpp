// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <array>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "platform/linux/store/StoreFile.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/Sandbox.h"
#include "tools/twctl/show/Terminal.h"
#include "tools/twctl/sql/SqlReader.h"
#include "tools/twctl/sql/SqlRun.h"

namespace tonewerk {
namespace {

// What is shown at the end. Parts without rows are left out.
struct SandboxPart {
  const char* title;
  const char* kind;  // in JSON
  const char* query;
};
constexpr std::array<SandboxPart, 5> kParts = {{
    {"Sessions", "session",
     "SELECT service, application, ending, messages, redundant_messages AS redundant,"
     " round(active_seconds, 3) AS active_seconds, overloads FROM session ORDER BY id"},
    {"Played", "volume_stretch",
     "SELECT application, seconds, volume, device, sample_rate, channels, format FROM volume_stretch ORDER "
     "BY id"},
    {"Recorded", "input_stretch",
     "SELECT application, seconds, device, mode, vocoders FROM input_stretch ORDER BY id"},
    {"Played in a group", "gather_stretch",
     "SELECT application, seconds, device, sample_rate, channels, format FROM gather_stretch ORDER BY id"},
    {"Issues", "issue",
     "SELECT application, kind, node, duration_seconds, buffer_frames, io_cycle FROM issue ORDER BY id"},
}};

// The daemon is in the directory of this program.
std::string daemonProgram() {
  std::error_code error;
  return std::filesystem::read_symlink("/proc/self/exe", error).parent_path() / "twreportingd";
}

std::vector<std::string> commandOr(std::vector<std::string> given) {
  if (!given.empty()) return given;
  const char* shell = std::getenv("SHELL");
  return {shell != nullptr && *shell != '\0' ? shell : "/bin/sh"};
}

bool hasRows(SqlReader& reader, const std::string& query) {
  return !reader.rows("SELECT 1 FROM (" + query + ") LIMIT 1").empty();
}

void showPart(Tool& tool, SqlReader& reader, const SandboxPart& part, bool isFirst) {
  RowFormat format;
  std::string query = part.query;
  if (tool.asJson) {
    format.kind = RowFormat::Kind::kJson;
    query = std::string("SELECT '") + part.kind + "' AS view, * FROM (" + query + ")";
  } else {
    format.width = widthOf(tool);
    tool.out << (isFirst ? "" : "\n") << part.title << '\n';
  }
  const SqlOutcome outcome = runSql(reader, query, format, tool.out);
  if (outcome.problem) tool.warn(describe(*outcome.problem, query));
}

void showReports(Tool& tool, const std::string& stateDirectory) {
  SqlReader reader;
  if (const std::string problem = reader.open(storeFileIn(stateDirectory).path); !problem.empty()) {
    tool.warn(problem);
    return;
  }
  bool isFirst = true;
  for (const SandboxPart& part : kParts) {
    if (!hasRows(reader, part.query)) continue;
    showPart(tool, reader, part, isFirst);
    isFirst = false;
  }
  if (isFirst) tool.warn("no session was reported");
}

// `unread` are words before the command, which the parser does not know.
int runSandbox(Tool& tool, bool isKept, const std::vector<std::string>& unread) {
  if (tool.systemWide)
    return tool.fail(kWrongUsage, "--system excludes sandbox, which has directories of its own");
  if (!unread.empty() && unread.front() != "--")
    return tool.fail(kWrongUsage, "unknown option '" + unread.front() + "'");
  const std::vector<std::string>& given = tool.foreignWords;
  const std::vector<std::string> command = commandOr(given);
  Sandbox sandbox(daemonProgram());
  if (isKept) sandbox.keep();
  if (const std::string problem = sandbox.start(); !problem.empty()) return tool.fail(kNoDaemon, problem);
  if (given.empty() && tool.inDescriptor >= 0 && tool.outIsTerminal) {
    tool.out << "A shell with a daemon of its own. Its reports are shown when you leave the shell.\n";
  }
  tool.out.flush();
  const int status = sandbox.run(command);
  if (const std::string problem = sandbox.stop(); !problem.empty()) tool.warn(problem);
  showReports(tool, sandbox.stateDirectory());
  if (isKept) {
    tool.out.flush();
    tool.err << "twctl: kept " << sandbox.directory() << '\n';
  }
  return status;
}

}  // namespace

void addSandboxCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "sandbox", "Runs a command with a daemon of its own, and shows its reports");
  command.footer(
      "twctl sandbox [--keep] [--json] [--] [COMMAND [ARGUMENT...]]\n"
      "  twctl sandbox ./player          a program that reports, its sessions and summaries\n"
      "  twctl sandbox                   a shell, in which programs and twctl use that daemon\n"
      "The daemon has directories of its own and no D-Bus; they are removed at the end. It needs no rights.\n"
      "Exit status: that of COMMAND, 128 and the signal's number when a signal has ended it, 127 when there "
      "is\n"
      "no such command; 3 when the daemon cannot start.");
  command.prefix_command();
  const auto isKept = std::make_shared<bool>(false);
  command.add_flag("--keep", *isKept, "Keep the directories, and say where they are");
  command.callback(
      [&tool, &command, isKept] { tool.status = runSandbox(tool, *isKept, command.remaining()); });
}

}  // namespace tonewerk
