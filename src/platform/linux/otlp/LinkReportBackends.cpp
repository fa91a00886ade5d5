// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/LinkReportBackends.h"

#include <algorithm>

#include "platform/linux/otlp/CurlHttpClient.h"

namespace tonewerk {
namespace {

constexpr const char* kLocal = "local";

}  // namespace

LinkReportBackends LinkReportBackends::from(const std::optional<Value>& preference) {
  LinkReportBackends backends;
  backends.local = !preference;
  if (!preference) return backends;
  const ValueArray* entries = preference->asArray();
  if (entries == nullptr) {
    backends.problems.push_back("it is no array of texts: " + preference->text());
    return backends;
  }
  for (const Value& entry : *entries) {
    if (entry.asString() != nullptr) {
      backends.add(entry.text());
    } else {
      backends.problems.push_back("an entry is no text: " + entry.text());
    }
  }
  return backends;
}

void LinkReportBackends::add(const std::string& entry) {
  if (entry == kLocal) {
    local = true;
    return;
  }
  // An entry with an '@' is not logged, because it may contain a password.
  const std::string shown = entry.find('@') == std::string::npos ? "\"" + entry + "\"" : "an entry";
  const auto [url, problem, isChecked] = otlpLogsAddressOf(entry);
  if (!isChecked) {
    problems.push_back(shown + " cannot be checked: " + problem);
  } else if (url.empty()) {
    problems.push_back(shown + " is neither \"local\" nor an address: " + problem);
  } else if (std::any_of(endpoints.begin(), endpoints.end(),
                         [&url = url](const auto& known) { return known.url == url; })) {
    problems.push_back(shown + " is there twice");
  } else if (endpoints.size() == kMaxEndpoints) {
    problems.push_back(shown + " is one address too many");
  } else {
    endpoints.push_back({entry, url});
  }
}

std::optional<std::vector<std::string>> LinkReportBackends::names() const {
  std::vector<std::string> names;
  if (local) names.emplace_back(kLocal);
  for (const Endpoint& endpoint : endpoints) names.push_back(endpoint.base);
  if (names.empty()) return std::nullopt;
  return names;
}

}  // namespace tonewerk
