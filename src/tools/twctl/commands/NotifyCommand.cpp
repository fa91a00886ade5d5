// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <charconv>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <system_error>

#include "platform/NotificationHandlers.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

struct NotifyOptions {
  std::string name;
  std::string state;  // empty for none
};

std::optional<std::uint64_t> parseState(const std::string& text) {
  std::uint64_t state = 0;
  const auto parsed = std::from_chars(text.data(), text.data() + text.size(), state);
  const bool isWhole = parsed.ec == std::errc() && parsed.ptr == text.data() + text.size();
  return isWhole ? std::optional(state) : std::nullopt;
}

std::string problemWithState(const std::string& text) {
  return parseState(text) ? "" : "\"" + text + "\" is no number from 0 to 18446744073709551615";
}

// Opens the notifications' files, with or without a daemon.
NotificationFiles filesOf(const Tool& tool) {
  return NotificationFiles(tool.directories().runtime + "/notifications");
}

// False when `name` cannot name a notification; the problem is then printed.
bool takeName(Tool& tool, const std::string& name) {
  if (NotificationHandlers::isName(name)) return true;
  tool.status = tool.fail(kRefused, "\"" + name + "\" cannot name a notification");
  return false;
}

void post(Tool& tool, const NotifyOptions& options) {
  if (!takeName(tool, options.name)) return;
  const NotificationFiles files = filesOf(tool);
  const std::optional<std::uint64_t> state = parseState(options.state);
  const std::error_code error = state ? files.post(options.name, *state) : files.post(options.name);
  if (!error) return;
  tool.status = tool.fail(kRefused, files.directory() + "/" + options.name + ": " + error.message());
}

void get(Tool& tool, const NotifyOptions& options) {
  if (!takeName(tool, options.name)) return;
  const NotificationFiles files = filesOf(tool);
  std::error_code error;
  const std::optional<std::uint64_t> state = files.state(options.name, error);
  if (state) {
    Table(tool.out, tool.asJson, {"name", "state"}).add({Value(options.name), Value(*state)});
  } else if (error == std::errc::no_such_file_or_directory) {
    tool.status = tool.fail(kRefused, "nobody has posted " + options.name);
  } else {
    const bool isNumber = error != std::errc::result_out_of_range;
    tool.status =
        tool.fail(kRefused, files.directory() + "/" + options.name +
                                (isNumber ? ": " + error.message() : " holds no number of 64 bits"));
  }
}

using Action = void (*)(Tool& tool, const NotifyOptions& options);

std::shared_ptr<NotifyOptions> addAction(CLI::App& command, Tool& tool, Action action) {
  auto options = std::make_shared<NotifyOptions>();
  command.add_option("NAME", options->name, "Such as com.orvane.homedeck.ringerstate")->required();
  command.callback([&tool, options, action] { action(tool, *options); });
  return options;
}

}  // namespace

void addNotifyCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "notify", "Named notifications and their states");
  command.require_subcommand(1);

  CLI::App& posting = addCommand(command, tool, "post", "Tells whoever listens that something changed");
  posting
      .add_option("STATE", addAction(posting, tool, post)->state,
                  "The new state, a number of 64 bits; without it the state stays, or is 0")
      ->check(problemWithState);

  CLI::App& getting = addCommand(command, tool, "get", "The state that was posted last");
  addAction(getting, tool, get);
}

}  // namespace tonewerk
