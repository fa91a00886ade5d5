// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Who asks for which analytics events: what the preference "consumers" of the domain "com.orvane.metricon"
// says, an array of maps {"name": text, "events": [pattern, ...]}. A pattern is a shell's: *, ? and [...]
// stand for characters.
class AnalyticsConsumers {
 public:
  // Without the preference, one consumer "local" asks for "com.orvane.*". What cannot be read is left out and
  // said in `problems`, one text each.
  AnalyticsConsumers(const std::optional<Value>& preference, std::vector<std::string>& problems);

  // Whether anybody asks for events of this name.
  bool wants(const std::string& eventName) const;

 private:
  void add(const Value& consumer, std::size_t index, std::vector<std::string>& problems);

  std::vector<std::string> patterns_;
};

}  // namespace tonewerk
