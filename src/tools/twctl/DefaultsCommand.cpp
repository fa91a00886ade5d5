// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <filesystem>
#include <memory>
#include <ostream>
#include <string>
#include <system_error>

#include "monitor/FeatureTable.h"
#include "platform/LogCategory.h"
#include "platform/linux/NotificationFiles.h"
#include "platform/linux/TomlPreferenceStore.h"
#include "platform/linux/TomlText.h"
#include "tools/twctl/Commands.h"
#include "tools/twctl/Table.h"
#include "tools/twctl/ToolLog.h"

namespace tonewerk {
namespace {

struct DefaultsOptions {
  std::string domain;
  std::optional<std::string> key;
  std::string value;
};

// The preference files, with or without a daemon.
class Preferences {
 public:
  explicit Preferences(const Tool& tool)
      : log_(tool),
        category_(log_, "com.orvane.tonewerk", "twctl"),
        store_(tool.directories().configuration + "/preferences", tool.directories().state + "/preferences",
               category_) {}

  TomlPreferenceStore& store() { return store_; }

 private:
  ToolLog log_;
  LogCategory category_;
  TomlPreferenceStore store_;
};

void read(Tool& tool, const DefaultsOptions& options) {
  Preferences preferences(tool);
  ValueMap found = preferences.store().readAll(options.domain);
  if (options.key) {
    const Value* value = found.find(*options.key);
    found = value == nullptr ? ValueMap() : ValueMap{{*options.key, *value}};
  }
  if (found.empty()) {
    const std::string what = options.key ? *options.key + " of " + options.domain : options.domain;
    tool.status = tool.fail(kRefused, "nothing is set for " + what);
    return;
  }
  Table table(tool.out, tool.asJson, {"key", "value"});
  for (const ValueMap::Entry& entry : found) table.add({Value(entry.key), entry.value});
}

// A daemon that follows the preference looks at it again. Without a runtime directory none runs.
void announce(const Tool& tool, const DefaultsOptions& options) {
  const std::optional<std::string> notification = notificationOfPreference(options.domain, *options.key);
  const std::string runtime = tool.directories().runtime;
  std::error_code none;
  if (!notification || !std::filesystem::is_directory(runtime, none)) return;
  if (const std::error_code error = NotificationFiles(runtime + "/notifications").post(*notification)) {
    tool.err << "twctl: done, but a running daemon is not told of it: " << *notification << ": "
             << error.message() << '\n';
  }
}

// What the store says of a change that it refused.
void finish(Tool& tool, const DefaultsOptions& options, const std::error_code& error,
            const std::string& problem) {
  if (!error) return announce(tool, options);
  tool.status = tool.fail(kRefused, problem.empty() ? error.message() : problem);
}

void write(Tool& tool, const DefaultsOptions& options) {
  Preferences preferences(tool);
  const Value value = parseTomlValue(options.value).value_or(Value(options.value));
  std::string problem;
  const std::error_code error = preferences.store().write(options.domain, *options.key, value, &problem);
  finish(tool, options, error, problem);
}

void remove(Tool& tool, const DefaultsOptions& options) {
  Preferences preferences(tool);
  std::string problem;
  const std::error_code error = preferences.store().remove(options.domain, *options.key, &problem);
  finish(tool, options, error, problem);
}

using Action = void (*)(Tool& tool, const DefaultsOptions& options);

std::shared_ptr<DefaultsOptions> addAction(CLI::App& command, Tool& tool, Action action) {
  auto options = std::make_shared<DefaultsOptions>();
  command.add_option("DOMAIN", options->domain, "Such as com.orvane.metricon")->required();
  command.callback([&tool, options, action] { action(tool, *options); });
  return options;
}

}  // namespace

void addDefaultsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "defaults", "The preferences, as configured and as written here");
  command.require_subcommand(1);

  CLI::App& reading = addCommand(command, tool, "read", "What a domain holds, or one key of it");
  reading.add_option("KEY", addAction(reading, tool, read)->key, "Only this key");

  CLI::App& writing = addCommand(command, tool, "write", "Sets a key");
  const auto options = addAction(writing, tool, write);
  writing.add_option("KEY", options->key, "The key")->required();
  writing.add_option("VALUE", options->value, "A TOML value (true, 5, 2.5, [\"a\", \"b\"]), or else a text")
      ->required();

  CLI::App& removing = addCommand(command, tool, "delete", "Takes back what was written for a key");
  removing.add_option("KEY", addAction(removing, tool, remove)->key, "The key")->required();
}

}  // namespace tonewerk
