// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cmath>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <sys/wait.h>
#include <system_error>
#include <utility>
#include <vector>

#include "protocol/Requests.h"
#include "tools/recording/RecordingFile.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/OfflineProgram.h"
#include "tools/twctl/commands/RecordingPlayer.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

struct ReplayOptions {
  std::string file;
  std::string speed = "1";
  bool isOffline = false;
  std::string store;
};

// "max", or a number above 0.
std::optional<double> speedOf(const std::string& text) {
  if (text == "max") return std::numeric_limits<double>::infinity();
  const Value value = valueOfArgument(text);
  if (value.asString() != nullptr || value.asBoolean() != nullptr || !(value.number() > 0.0))
    return std::nullopt;
  return value.number();
}

// Runs the program with this one's streams, and returns its exit status.
int replayOffline(Tool& tool, const ReplayOptions& options) {
  std::vector<std::string> words{offlineProgram()};
  if (tool.asJson) words.emplace_back("--json");
  words.insert(words.end(), {options.file, options.store});
  tool.out.flush();
  int status = 0;
  if (const std::error_code error = runProgram(words, {}, status))
    return tool.fail(kRefused, words[0] + ": " + error.message());
  if (WIFEXITED(status)) return WEXITSTATUS(status);
  return tool.fail(kRefused, words[0] + " has ended unexpectedly");
}

void replay(Tool& tool, const ReplayOptions& options) {
  const auto speed = speedOf(options.speed);
  if (!speed) {
    tool.status = tool.fail(kWrongUsage, "--speed must be a number above 0 or max");
    return;
  }
  std::string problem;
  const std::optional<Recording> recording =
      readRecordingFile(options.file, requests::all(), tool.json, problem);
  if (!recording) {
    tool.status = tool.fail(kWrongUsage, options.file + ": " + problem);
    return;
  }

  const auto connect = [&tool]() -> std::unique_ptr<DaemonCalls> {
    auto daemon = std::make_unique<DaemonCalls>(tool);
    return daemon->connect(DaemonCalls::Role::kClient) ? std::move(daemon) : nullptr;
  };
  RecordingPlayer player(connect, *speed, [&](const RecordedStep& call, const std::string& why) {
    tool.status = tool.fail(kRefused, options.file + ": line " + std::to_string(call.line) + ": " + why);
  });
  if (const std::error_code error = player.play(*recording)) {
    if (error == std::errc::not_connected) return;  // the user has been told
    tool.status =
        tool.fail(kNoDaemon, error == std::errc::timed_out ? "the daemon does not answer"
                                                           : "the daemon is gone: " + error.message());
    return;
  }
  Table(tool.out, tool.asJson, {"requests", "refused"})
      .add({Value(recording->requests()), Value(player.refused())});
}

}  // namespace

void addReplayCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "replay", "Plays a recording on connections that end with it");
  command.footer(
      "A recording is JSON Lines:\n"
      "  {\"at\": seconds, \"call\": \"sendMessage\", \"params\": [{\"key\": value}, category, type, [ID] or "
      "null]}\n"
      "Lines may also name a client, say when it connects and disconnects, describe the device, and say\n"
      "that the daemon began again; see twctl(1).\n"
      "A value {\"now\": offset} is the time of sending plus so many seconds. Everything is checked before\n"
      "anything is played.");
  const auto options = std::make_shared<ReplayOptions>();
  command.add_option("FILE", options->file, "The recording")->required();
  command.add_option("--speed", options->speed, "1 as recorded, 2 twice as fast, max without pauses")
      ->capture_default_str();
  CLI::Option* offline = command.add_flag("--offline", options->isOffline,
                                          "To the core itself instead of a daemon, without pauses");
  CLI::Option* store = command.add_option("-o,--output", options->store, "The store to make, with --offline");
  store->type_name("STORE")->needs(offline);
  offline->needs(store)->excludes("--speed");
  command.callback([&tool, options] {
    if (options->isOffline) {
      tool.status = replayOffline(tool, *options);
    } else {
      replay(tool, *options);
    }
  });
}

}  // namespace tonewerk
