// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <system_error>

#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kEndTimeout{30};

// A daemon that ends does not answer; its connection ends.
void kill(Tool& tool) {
  DaemonCalls daemon(tool);
  if (!daemon.connect(DaemonCalls::Role::kClient)) return;
  std::error_code error;
  const auto answer = daemon.client().call(requests::kKillService.name, {}, kEndTimeout, error);
  if (answer && answer->error) {
    tool.status = tool.fail(kRefused, DaemonCalls::describe(requests::kKillService.name, *answer->error));
  } else if (error == std::errc::timed_out) {
    tool.status = tool.fail(kNoDaemon, "the daemon has not ended");
  }
}

}  // namespace

void addKillCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "kill", "Ends the daemon at once; what it was given to store is stored first");
  command.callback([&tool] { kill(tool); });
}

}  // namespace tonewerk
