// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cerrno>
#include <cmath>
#include <fstream>
#include <limits>
#include <memory>
#include <string>
#include <system_error>

#include "protocol/Requests.h"
#include "tools/recording/Recording.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/RecordingPlayer.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

struct ReplayOptions {
  std::string file;
  std::string speed = "1";
};

// "max", or a number above 0.
std::optional<double> speedOf(const std::string& text) {
  if (text == "max") return std::numeric_limits<double>::infinity();
  const Value value = valueOfArgument(text);
  if (value.asString() != nullptr || value.asBoolean() != nullptr || !(value.number() > 0.0))
    return std::nullopt;
  return value.number();
}

std::optional<Recording> readRecording(Tool& tool, const std::string& file) {
  std::string problem;
  errno = 0;
  std::ifstream text(file);
  std::optional<Recording> recording;
  if (text) recording = Recording::read(text, requests::all(), tool.json, problem);
  // A directory can be opened, but reading it fails.
  if (!text.is_open() || text.bad()) {
    const int reason = errno != 0 ? errno : EIO;
    tool.status = tool.fail(kWrongUsage, file + ": " + std::generic_category().message(reason));
    return std::nullopt;
  }
  if (!recording) tool.status = tool.fail(kWrongUsage, file + ": " + problem);
  return recording;
}

void replay(Tool& tool, const ReplayOptions& options) {
  const auto speed = speedOf(options.speed);
  if (!speed) {
    tool.status = tool.fail(kWrongUsage, "--speed must be a number above 0 or max");
    return;
  }
  const std::optional<Recording> recording = readRecording(tool, options.file);
  DaemonCalls daemon(tool);
  if (!recording || !daemon.connect(DaemonCalls::Role::kClient)) return;

  RecordingPlayer player(daemon.client(), *speed, [&](const RecordedCall& call, const std::string& why) {
    tool.status = tool.fail(kRefused, options.file + ": line " + std::to_string(call.line) + ": " + why);
  });
  if (const std::error_code error = player.play(*recording)) {
    tool.status =
        tool.fail(kNoDaemon, error == std::errc::timed_out ? "the daemon does not answer"
                                                           : "the daemon is gone: " + error.message());
    return;
  }
  Table(tool.out, tool.asJson, {"requests", "refused"})
      .add({Value(recording->calls().size()), Value(player.refused())});
}

}  // namespace

void addReplayCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "replay", "Plays a recording on one connection, which ends with it");
  command.footer(
      "A recording is JSON Lines:\n"
      "  {\"at\": seconds, \"call\": \"sendMessage\", \"params\": [{\"key\": value}, category, type, [ID] or "
      "null]}\n"
      "A value {\"now\": offset} is the time of sending plus so many seconds. Everything is checked before\n"
      "anything is played.");
  const auto options = std::make_shared<ReplayOptions>();
  command.add_option("FILE", options->file, "The recording")->required();
  command.add_option("--speed", options->speed, "1 as recorded, 2 twice as fast, max without pauses")
      ->capture_default_str();
  command.callback([&tool, options] { replay(tool, *options); });
}

}  // namespace tonewerk
