// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <filesystem>
#include <memory>
#include <ostream>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/Log.h"
#include "platform/PreferenceSchema.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "platform/linux/preferences/TomlFile.h"
#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "platform/linux/preferences/TomlText.h"
#include "protocol/FeatureTable.h"
#include "tools/twctl/ToolLog.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/PreferenceCheck.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

struct DefaultsOptions {
  std::string domain;
  std::optional<std::string> key;
  std::string value;
};

// Opens the preference files, with or without a daemon.
class Preferences {
 public:
  explicit Preferences(const Tool& tool)
      : log_(tool),
        category_(log_, "com.orvane.tonewerk", "twctl"),
        store_(tool.directories().configuration + "/preferences", tool.directories().state + "/preferences",
               category_),
        facts_(tool.directories().configuration + "/device-facts.toml", category_) {}

  TomlPreferenceStore& store() { return store_; }

  // The device facts are all configured.
  TomlPreferenceStore::Layers layersOf(const std::string& domain) {
    if (domain != kDeviceFacts) return store_.readLayers(domain);
    facts_.refresh();
    return {facts_.values(), {}};
  }

 private:
  ToolLog log_;
  LogCategory category_;
  TomlPreferenceStore store_;
  TomlFile facts_;
};

const std::vector<Preference>& schemaWith(const std::string& domain) {
  return domain == kDeviceFacts ? deviceFactSchema() : preferenceSchema();
}

// A key that is set or has a default.
struct Entry {
  std::string key;
  std::optional<Value> value;
  const char* from;
};

// Lists the keys that the daemon knows in the order of its schema, then the others.
std::vector<Entry> entriesOf(const std::string& domain, const TomlPreferenceStore::Layers& layers) {
  std::vector<Entry> entries;
  const auto add = [&](const std::string& key, const Preference* known) {
    if (const Value* written = layers.written.find(key)) {
      entries.push_back({key, *written, "state"});
    } else if (const Value* configured = layers.configured.find(key)) {
      entries.push_back({key, *configured, "configuration"});
    } else if (known != nullptr) {
      entries.push_back({key, known->fallback, "default"});
    }
  };
  for (const Preference& preference : schemaWith(domain)) {
    if (preference.domain == domain) add(std::string(preference.key), &preference);
  }
  ValueMap set = layers.configured;
  set.merge(layers.written);
  for (const ValueMap::Entry& entry : set) {
    if (findPreference(domain, entry.key) == nullptr) add(entry.key.string(), nullptr);
  }
  return entries;
}

// Writes a boolean as in the file; its text() would be a number.
const char* wordOf(bool value) { return value ? "true" : "false"; }

Table::Cell cellOf(const std::optional<Value>& value) {
  if (!value) return Table::Cell("(none)", "null");
  const bool* boolean = value->asBoolean();
  return boolean == nullptr ? Table::Cell(*value) : Table::Cell(wordOf(*boolean), wordOf(*boolean));
}

void read(Tool& tool, const DefaultsOptions& options) {
  const PagedOutput pages(tool);
  Preferences preferences(tool);
  std::vector<Entry> entries = entriesOf(options.domain, preferences.layersOf(options.domain));
  if (options.key) std::erase_if(entries, [&](const Entry& entry) { return entry.key != *options.key; });
  if (entries.empty()) {
    const std::string what = options.key ? *options.key + " of " + options.domain : options.domain;
    tool.status =
        tool.fail(kRefused, "nothing is set for " + what + preferenceHint(options.domain, options.key));
    return;
  }
  {
    // The value is last, because it may be long. It is not cut, because all of it counts.
    Table table(tool.out, tool.asJson, {"key", "from", "value"});
    for (const Entry& entry : entries) table.add({Value(entry.key), Value(entry.from), cellOf(entry.value)});
  }
  for (const Entry& entry : entries) {
    if (std::string_view(entry.from) == "default") continue;
    for (const std::string& problem : unknownKeys(options.domain, {{entry.key, *entry.value}}))
      tool.warn(problem);
    for (const std::string& problem : preferenceProblems(options.domain, entry.key, *entry.value))
      tool.warn(problem);
  }
}

// Notifies a daemon that watches the preference, so that it reads it again. Without a runtime directory no
// daemon runs.
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

// Announces a change, or prints why the store has refused it.
void finish(Tool& tool, const DefaultsOptions& options, const std::error_code& error,
            const std::string& problem) {
  if (!error) return announce(tool, options);
  tool.status = tool.fail(kRefused, problem.empty() ? error.message() : problem);
}

// For a preference that is a text, the argument is that text, even if it could be read as another type.
Value valueToWrite(const DefaultsOptions& options) {
  const Preference* known = findPreference(options.domain, *options.key);
  const std::optional<Value> value = parseTomlValue(options.value);
  const bool isText = known != nullptr && known->type == PreferenceType::kText;
  return !value || (isText && value->asString() == nullptr) ? Value(options.value) : *value;
}

// Why nothing may be written or deleted; empty when it may.
std::string problemWithTarget(const Tool& tool, const DefaultsOptions& options, bool isNew) {
  if (options.domain == kDeviceFacts) {
    return "device facts are not preferences; edit " + tool.directories().configuration +
           "/device-facts.toml and reload the daemon";
  }
  const bool isMistyped =
      isNew && !knownKeys(options.domain).empty() && findPreference(options.domain, *options.key) == nullptr;
  return isMistyped ? "the daemon does not read " + *options.key + " of " + options.domain +
                          preferenceHint(options.domain, options.key)
                    : "";
}

void write(Tool& tool, const DefaultsOptions& options) {
  if (const std::string problem = problemWithTarget(tool, options, true); !problem.empty()) {
    tool.status = tool.fail(kRefused, problem);
    return;
  }
  const Value value = valueToWrite(options);
  const Preference* known = findPreference(options.domain, *options.key);
  const std::vector<std::string> problems = preferenceProblems(options.domain, *options.key, value);
  for (const std::string& problem : problems) tool.status = tool.fail(kRefused, problem);
  if (!problems.empty()) return;
  Preferences preferences(tool);
  std::string problem;
  const std::error_code error = preferences.store().write(options.domain, *options.key, value, &problem);
  finish(tool, options, error, problem);
  if (error) return;
  if (known == nullptr) {
    tool.warn("the daemon does not read " + options.domain + preferenceHint(options.domain, options.key));
  } else if (known->keeper == PreferenceKeeper::kDaemon) {
    tool.warn("the daemon keeps " + *options.key + " itself, and will write over it");
  }
}

void remove(Tool& tool, const DefaultsOptions& options) {
  if (const std::string problem = problemWithTarget(tool, options, false); !problem.empty()) {
    tool.status = tool.fail(kRefused, problem);
    return;
  }
  Preferences preferences(tool);
  std::string problem;
  const std::error_code error = preferences.store().remove(options.domain, *options.key, &problem);
  finish(tool, options, error, problem);
}

const char* textOf(PreferenceKeeper keeper) {
  return keeper == PreferenceKeeper::kDaemon ? "daemon" : "people";
}

std::string defaultText(const Preference& preference) {
  if (!preference.fallback) return "none";
  const bool* boolean = preference.fallback->asBoolean();
  return boolean == nullptr ? preference.fallback->text() : wordOf(*boolean);
}

// Prints a block for each preference, because a description is too long for a row.
void describeToPeople(std::ostream& out, const std::vector<const Preference*>& preferences) {
  std::string_view domain;
  for (const Preference* preference : preferences) {
    if (preference->domain != domain) out << (domain.empty() ? "" : "\n") << preference->domain << '\n';
    domain = preference->domain;
    out << "  " << preference->key << "  " << typeText(*preference);
    if (!preference->unit.empty()) out << ", in " << preference->unit;
    out << "\n    " << preference->meaning << '\n';
    out << "    default " << defaultText(*preference)
        << "; a change counts: " << effectText(preference->effect) << '\n';
    if (preference->keeper == PreferenceKeeper::kDaemon) out << "    kept by the daemon itself\n";
  }
}

void describeToPrograms(std::ostream& out, const std::vector<const Preference*>& preferences) {
  Table table(out, true, {"domain", "key", "type", "default", "keeper", "meaning", "unit", "counts"});
  for (const Preference* preference : preferences) {
    table.add({Value(preference->domain), Value(preference->key), Value(typeText(*preference)),
               cellOf(preference->fallback), Value(textOf(preference->keeper)), Value(preference->meaning),
               cellOf(preference->unit.empty() ? std::nullopt : std::optional<Value>(preference->unit)),
               Value(effectText(preference->effect))});
  }
}

void describe(Tool& tool, const DefaultsOptions& options) {
  const PagedOutput pages(tool);
  std::vector<const Preference*> described;
  for (const std::vector<Preference>* schema : {&preferenceSchema(), &deviceFactSchema()}) {
    for (const Preference& preference : *schema) {
      const bool isWanted = (options.domain.empty() || options.domain == preference.domain) &&
                            (!options.key || *options.key == preference.key);
      if (isWanted) described.push_back(&preference);
    }
  }
  if (described.empty()) {
    const std::string what = options.key ? *options.key + " of " + options.domain : options.domain;
    tool.status =
        tool.fail(kRefused, "the daemon does not read " + what + preferenceHint(options.domain, options.key));
  } else if (tool.asJson) {
    describeToPrograms(tool.out, described);
  } else {
    describeToPeople(tool.out, described);
  }
}

using Action = void (*)(Tool& tool, const DefaultsOptions& options);

std::shared_ptr<DefaultsOptions> addAction(CLI::App& command, Tool& tool, Action action) {
  auto options = std::make_shared<DefaultsOptions>();
  command.add_option("DOMAIN", options->domain, "Such as com.orvane.metricon");
  command.callback([&tool, options, action] { action(tool, *options); });
  return options;
}

// Adds an action whose domain is required.
std::shared_ptr<DefaultsOptions> addActionOnDomain(CLI::App& command, Tool& tool, Action action) {
  auto options = addAction(command, tool, action);
  command.get_option("DOMAIN")->required();
  return options;
}

}  // namespace

void addDefaultsCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "defaults", "The preferences: what they are, and what they may be");
  command.require_subcommand(1);

  CLI::App& reading = addCommand(command, tool, "read", "What counts in a domain, or for one key of it");
  reading.footer(
      "From says where a value is: the default, the configuration, or the state, which is what was\n"
      "written here.");
  reading.add_option("KEY", addActionOnDomain(reading, tool, read)->key, "Only this key");

  CLI::App& writing = addCommand(command, tool, "write", "Sets a key");
  const auto options = addActionOnDomain(writing, tool, write);
  writing.add_option("KEY", options->key, "The key")->required();
  writing.add_option("VALUE", options->value, "A TOML value (true, 5, 2.5, [\"a\", \"b\"]), or else a text")
      ->required();

  CLI::App& removing = addCommand(command, tool, "delete", "Takes back what was written for a key");
  removing.add_option("KEY", addActionOnDomain(removing, tool, remove)->key, "The key")->required();

  CLI::App& describing =
      addCommand(command, tool, "describe", "What the daemon reads: types, defaults, meanings");
  describing.footer(
      "A change counts at once, when its notification is posted (which write and delete do), after a "
      "reload,\n"
      "in sessions that start afterwards, or at the daemon's next start. The domain device-facts stands for\n"
      "the device facts, which only read and describe take.");
  describing.add_option("KEY", addAction(describing, tool, describe)->key, "Only this key");
}

}  // namespace tonewerk
