// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/RecordedDevice.h"

#include <algorithm>
#include <array>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "platform/PreferenceSchema.h"
#include "platform/linux/preferences/TomlFile.h"
#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "tools/recording/RecordedProperties.h"
#include "tools/twctl/ToolLog.h"

namespace tonewerk {
namespace {

// Preferences of other domains say where reports go and how much is kept. They may have the addresses of
// others, and a replay does not use them.
constexpr std::array<std::string_view, 4> kDomains{"com.orvane.metricon", "com.orvane.tonewerk.twreporting",
                                                   "com.orvane.tonewerk", "com.orvane.homedeck"};

ValueMap factsOf(const std::string& file, const LogCategory& log) {
  TomlFile facts(file, log);
  facts.refresh();
  ValueMap booleans;
  for (const ValueMap::Entry& fact : facts.values()) {
    if (fact.value.asBoolean() != nullptr) booleans.set(fact.key, fact.value);
  }
  return booleans;
}

ValueMap preferencesOf(const TomlPreferenceStore& store) {
  ValueMap preferences;
  for (const Preference& known : preferenceSchema()) {
    const bool isWanted = std::find(kDomains.begin(), kDomains.end(), known.domain) != kDomains.end();
    if (!isWanted || known.keeper == PreferenceKeeper::kDaemon) continue;
    const std::optional<Value> value = store.read(known.domain, known.key);
    if (!value) continue;
    const Value* domain = preferences.find(known.domain);
    ValueMap values = domain == nullptr ? ValueMap() : *domain->asMap();
    values.set(known.key, *value);
    preferences.set(known.domain, values);
  }
  return preferences;
}

}  // namespace

ValueMap recordedDevice(const Tool& tool, std::uint32_t daemonUser) {
  ToolLog toolLog(tool);
  const LogCategory log(toolLog, "com.orvane.tonewerk", "twctl");
  const Directories directories = tool.directories();
  const TomlPreferenceStore store(directories.configuration + "/preferences",
                                  directories.state + "/preferences", log);
  ValueMap device{{recorded::kUser, static_cast<std::int64_t>(daemonUser)}};
  const ValueMap facts = factsOf(directories.configuration + "/device-facts.toml", log);
  if (!facts.empty()) device.set(recorded::kFacts, facts);
  const ValueMap preferences = preferencesOf(store);
  if (!preferences.empty()) device.set(recorded::kPreferences, preferences);
  return device;
}

}  // namespace tonewerk
