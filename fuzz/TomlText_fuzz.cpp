// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a file of preferences or device facts. What was read can be written, and reads as equal
// values. Then gives each value to whatever reads a preference of its own format, and makes it the value of
// every preference.
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "FuzzInput.h"
#include "platform/JournalPreferences.h"
#include "platform/Log.h"
#include "platform/PreferenceSchema.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/otlp/LinkReportBackends.h"
#include "platform/linux/preferences/TomlText.h"
#include "platform/linux/store/AnalyticsConsumers.h"
#include "platform/linux/system/AccountPreferences.h"
#include "support/TestPlatform.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

void expectTexts(const std::vector<std::string>& texts) {
  for (const std::string& text : texts) expect(!text.empty() && isUtf8(text));
}

void use(const Value& value) {
  for (const Preference& preference : preferenceSchema()) {
    const auto problem = problemWith(preference, value);
    expect(!problem || !problem->empty());
  }
  const LinkReportBackends backends = LinkReportBackends::from(value);
  expect(backends.endpoints.size() <= LinkReportBackends::kMaxEndpoints);
  expectTexts(backends.problems);
  std::vector<std::string> problems;
  const AnalyticsConsumers consumers(value, problems);
  (void)consumers.wants("com.orvane.audio.volume");
  expectTexts(problems);
}

// The value of every preference; some make a daemon slow or small, none breaks it.
void useEverywhere(const Value& value) {
  MemoryPreferenceStore preferences;
  for (const Preference& preference : preferenceSchema()) {
    preferences.configure(preference.domain, preference.key, value);
  }
  std::string problems;
  const JournalPreferences journal = readJournalPreferences(preferences, problems);
  expect(isUtf8(problems) && journal.bytes < std::uint64_t{1} << 60);
  expect(journal.syncInterval >= std::chrono::seconds(0) && journal.syncInterval <= std::chrono::hours(1));
  expect(journal.keepsDropped >= std::chrono::seconds(0));
  const ManualClock clock;
  Accounts accounts(TestPlatform::kOwner, clock);
  MemoryLog log;
  applyAccountPreferences(accounts, preferences, LogCategory(log, "com.orvane.tonewerk", "twrs"));
  for (const ResourceFacts& facts : kResources) {
    expect(facts.preference.empty() || accounts.totals().total(facts.resource) >= kMiB);
  }
}

void read(std::string_view text) {
  std::string problem;
  const std::optional<ValueMap> values = parseToml(text, problem);
  expect(values.has_value() == problem.empty());
  (void)parseTomlValue(text);
  if (!values) return;
  if (const std::optional<std::string> written = tomlText(*values, problem)) {
    const std::optional<ValueMap> again = parseToml(*written, problem);
    expect(again && *again == *values);
  } else {
    expect(!problem.empty());
  }
  for (const ValueMapEntry& entry : *values) {
    expect(isUtf8(entry.key));
    use(entry.value);
    useEverywhere(entry.value);
  }
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::read({reinterpret_cast<const char*>(data), size});
  return 0;
}
