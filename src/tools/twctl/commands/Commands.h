// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "tools/twctl/Tool.h"

namespace CLI {
class App;
}

namespace tonewerk {

// Add the tool's commands, each of which has a file of its own, to `app` and declare their arguments. A
// command runs when the command line names it, and sets the exit status in `tool`, which outlives `app`.
// Also runs when there is no command.
void addStatusCommand(CLI::App& app, Tool& tool);
void addDoctorCommand(CLI::App& app, Tool& tool);
void addListCommand(CLI::App& app, Tool& tool);
void addValidateCommand(CLI::App& app, Tool& tool);
void addSendCommand(CLI::App& app, Tool& tool);
void addReplayCommand(CLI::App& app, Tool& tool);
void addRecordCommand(CLI::App& app, Tool& tool);
void addTopCommand(CLI::App& app, Tool& tool);
void addTailCommand(CLI::App& app, Tool& tool);
void addEventsCommand(CLI::App& app, Tool& tool);
void addMetricsCommand(CLI::App& app, Tool& tool);
void addPowerCommand(CLI::App& app, Tool& tool);
void addRtcCommand(CLI::App& app, Tool& tool);
void addSessionsCommand(CLI::App& app, Tool& tool);
// Adds session and explain.
void addSessionCommands(CLI::App& app, Tool& tool);
void addGlitchesCommand(CLI::App& app, Tool& tool);
void addTraceCommand(CLI::App& app, Tool& tool);
void addReportCommand(CLI::App& app, Tool& tool);
void addServeCommand(CLI::App& app, Tool& tool);
void addSqlCommand(CLI::App& app, Tool& tool);
void addExportCommand(CLI::App& app, Tool& tool);
void addDefaultsCommand(CLI::App& app, Tool& tool);
void addNotifyCommand(CLI::App& app, Tool& tool);
// Adds captures, drafts and whirlcaps.
void addDiagnosticsCommands(CLI::App& app, Tool& tool);
void addChannelsCommand(CLI::App& app, Tool& tool);
void addPathsCommand(CLI::App& app, Tool& tool);
void addKillCommand(CLI::App& app, Tool& tool);
void addSandboxCommand(CLI::App& app, Tool& tool);
void addCompletionCommand(CLI::App& app, Tool& tool);

// Adds a command with the common options.
CLI::App& addCommand(CLI::App& app, Tool& tool, const std::string& name, const std::string& description);
void addCommonOptions(CLI::App& app, Tool& tool);

// Reads the command line, runs its command and returns the exit status.
[[nodiscard]] int runCommandLine(int argc, const char* const* argv, Tool& tool);

}  // namespace tonewerk
