// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/Commands.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <exception>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/twctl/commands/CompletionCommand.h"
#include "tools/twctl/completion/CompletionPoint.h"
#include "tools/twctl/input/UsageProblem.h"

namespace tonewerk {
namespace {

// Parses the tool's own words. Another program's command line is set aside unread, whatever it looks like.
void parse(CLI::App& app, Tool& tool, int argc, const char* const* argv) {
  std::vector<std::string> words(argv + std::min(argc, 1), argv + argc);
  if (const auto place = foreignCommandIn(app, words)) {
    const auto foreign = words.begin() + static_cast<std::ptrdiff_t>(*place);
    tool.foreignWords.assign(foreign, words.end());
    words.erase(foreign, words.end());
    if (words.back() == "--") words.pop_back();
  }
  std::reverse(words.begin(), words.end());  // as the parser wants them
  app.parse(std::move(words));
}

// Gives the process its time zone back: --utc is for one command line.
class KeptTimeZone {
 public:
  explicit KeptTimeZone(const Tool& tool) : tool_(tool) {
    if (const char* zone = std::getenv("TZ")) before_ = zone;
  }
  KeptTimeZone(const KeptTimeZone&) = delete;
  KeptTimeZone& operator=(const KeptTimeZone&) = delete;
  ~KeptTimeZone() {
    if (!tool_.isUtc) return;
    before_ ? ::setenv("TZ", before_->c_str(), 1) : ::unsetenv("TZ");
    ::tzset();
  }

 private:
  const Tool& tool_;
  std::optional<std::string> before_;
};

// The zone of the process, so that every time that is shown, read or counted by days follows it, in the
// libraries, too. Nothing else runs yet.
void useUtc(Tool& tool) {
  tool.isUtc = true;
  ::setenv("TZ", "UTC0", 1);
  ::tzset();
}

}  // namespace

CLI::App& addCommand(CLI::App& app, Tool& tool, const std::string& name, const std::string& description) {
  CLI::App& command = *app.add_subcommand(name, description);
  addCommonOptions(command, tool);
  return command;
}

void addCommonOptions(CLI::App& app, Tool& tool) {
  app.add_flag("--json", tool.asJson, "One JSON object a line instead of a table");
  app.add_flag("--system", tool.systemWide, "The system's daemon and directories, whoever asks");
  app.add_flag_callback(
      "--utc", [&tool] { useUtc(tool); }, "Times in UTC instead of the local zone");
  app.add_flag("--no-pager", tool.withoutPager, "No pager for long output on a terminal");
}

int runCommandLine(int argc, const char* const* argv, Tool& tool) {
  const KeptTimeZone zone(tool);
  CLI::App app("Talks to the reporting daemon, and reads what it has stored.", "twctl");
  app.set_version_flag("--version", std::string("twctl ") + TONEWERK_VERSION);
  app.footer(
      "Exit status: 0 done; 1 refused, not valid, not there, or output that cannot be written; 2 wrong\n"
      "usage, a wrong query or recording included; 3 no daemon answers.");
  app.require_subcommand(0, 1);
  addCommonOptions(app, tool);
  addStatusCommand(app, tool);
  addDoctorCommand(app, tool);
  addListCommand(app, tool);
  addValidateCommand(app, tool);
  addSendCommand(app, tool);
  addReplayCommand(app, tool);
  addRecordCommand(app, tool);
  addTopCommand(app, tool);
  addTailCommand(app, tool);
  addEventsCommand(app, tool);
  addMetricsCommand(app, tool);
  addPowerCommand(app, tool);
  addRtcCommand(app, tool);
  addSessionsCommand(app, tool);
  addSessionCommands(app, tool);
  addGlitchesCommand(app, tool);
  addTraceCommand(app, tool);
  addReportCommand(app, tool);
  addServeCommand(app, tool);
  addSqlCommand(app, tool);
  addExportCommand(app, tool);
  addDefaultsCommand(app, tool);
  addNotifyCommand(app, tool);
  addDiagnosticsCommands(app, tool);
  addChannelsCommand(app, tool);
  addPathsCommand(app, tool);
  addKillCommand(app, tool);
  addSandboxCommand(app, tool);
  addCompletionCommand(app, tool);
  try {
    if (const auto question = CompletionQuestion::read(argc, argv)) {
      answerCompletion(app, tool, *question);
      return tool.status;
    }
    parse(app, tool, argc, argv);
  } catch (const CLI::ParseError& error) {
    // The parser reports --help and --version in this way, too.
    const bool isAnswer = error.get_exit_code() == 0;
    tool.status =
        isAnswer ? app.exit(error, tool.out, tool.err) : tool.fail(kWrongUsage, usageProblem(app, error));
  } catch (const std::exception& error) {
    return tool.fail(kRefused, error.what());
  }
  // For example on a full disk. A list that is cut off must not look complete.
  if (!tool.out.flush() && tool.status == kDone) return tool.fail(kRefused, "cannot write the output");
  return tool.status;
}

}  // namespace tonewerk
