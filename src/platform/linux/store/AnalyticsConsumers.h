// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Knows which analytics events consumers ask for. The preference "consumers" of the domain
// "com.orvane.metricon" says so: an array of maps {"name": text, "events": [pattern, ...]}. A pattern is
// written as in a shell: *, ? and [...] stand for characters.
class AnalyticsConsumers {
 public:
  // Without the preference, one consumer "local" asks for "com.orvane.*". Entries and patterns that cannot be
  // read are left out, and `problems` gets one text for each.
  AnalyticsConsumers(const std::optional<Value>& preference, std::vector<std::string>& problems);

  // Whether a consumer asks for events of this name.
  bool wants(const std::string& eventName) const;

 private:
  void add(const Value& consumer, std::size_t index, std::vector<std::string>& problems);

  std::vector<std::string> patterns_;
};

}  // namespace tonewerk
