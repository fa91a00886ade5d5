// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/StoreBound.h"

#include <optional>

#include "platform/Log.h"
#include "platform/PreferenceSchema.h"
#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "platform/linux/store/ReportStore.h"

namespace tonewerk {
namespace {

// A file that does not parse is the business of `twctl doctor`.
class MuteLog final : public Log {
 public:
  bool isEnabled(std::string_view /*category*/, LogLevel /*level*/) const override { return false; }
  void write(std::string_view /*subsystem*/, std::string_view /*category*/, LogLevel /*level*/,
             std::string_view /*message*/) override {}
};

}  // namespace

double storeMegabytes(const Directories& directories) {
  MuteLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twctl");
  const TomlPreferenceStore store(directories.configuration + "/preferences",
                                  directories.state + "/preferences", category);
  const Preference& schema = *findPreference(ReportStore::kPreferenceDomain, ReportStore::kMaxMegabytesKey);
  const std::optional<Value> value =
      store.read(ReportStore::kPreferenceDomain, ReportStore::kMaxMegabytesKey);
  return value && !problemWith(schema, *value) ? value->number() : schema.fallback->number();
}

}  // namespace tonewerk
