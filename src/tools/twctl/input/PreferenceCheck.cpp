// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/PreferenceCheck.h"

#include "platform/PreferenceSchema.h"
#include "platform/linux/otlp/LinkReportBackends.h"
#include "platform/linux/otlp/LinuxLinkReport.h"
#include "platform/linux/store/AnalyticsConsumers.h"
#include "platform/linux/store/StoreMetricon.h"
#include "tools/twctl/input/Suggestion.h"
#include "values/ClosestName.h"

namespace tonewerk {
namespace {

bool is(const Preference& preference, std::string_view domain, std::string_view key) {
  return preference.domain == domain && preference.key == key;
}

// The problems that the daemon finds inside lists whose entries have a format of their own.
std::vector<std::string> problemsInside(const Preference& preference, const Value& value) {
  if (is(preference, LinuxLinkReport::kPreferenceDomain, LinuxLinkReport::kBackendsKey))
    return LinkReportBackends::from(value).problems;
  std::vector<std::string> problems;
  if (is(preference, StoreMetricon::kPreferenceDomain, StoreMetricon::kConsumersKey))
    static_cast<void>(AnalyticsConsumers(value, problems));
  return problems;
}

}  // namespace

std::vector<std::string> preferenceProblems(std::string_view domain, std::string_view key,
                                            const Value& value) {
  const Preference* preference = findPreference(domain, key);
  if (preference == nullptr) return {};
  if (auto problem = problemWith(*preference, value)) return {std::move(*problem)};
  std::vector<std::string> problems = problemsInside(*preference, value);
  const std::string place = std::string(key) + ": ";
  for (std::string& problem : problems) problem.insert(0, place);
  return problems;
}

std::vector<std::string> preferenceDomains() {
  std::vector<std::string> domains;
  for (const Preference& preference : preferenceSchema()) {
    if (domains.empty() || domains.back() != preference.domain) domains.emplace_back(preference.domain);
  }
  return domains;
}

std::string preferenceHint(const std::string& domain, const std::optional<std::string>& key) {
  const std::vector<std::string> keys = knownKeys(domain);
  if (!keys.empty()) return key ? "; " + hintFor(*key, keys) : "";
  std::vector<std::string> domains = preferenceDomains();
  domains.emplace_back(kDeviceFacts);
  const std::optional<std::string> meant = closestTo(domain, domains);
  return meant ? "; " + didYouMean(*meant) : "";
}

}  // namespace tonewerk
