// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/AnalyticsConsumers.h"

#include <algorithm>
#include <fnmatch.h>

namespace tonewerk {
namespace {

constexpr const char* kDefaultPattern = "com.orvane.*";

}  // namespace

AnalyticsConsumers::AnalyticsConsumers(const std::optional<Value>& preference,
                                       std::vector<std::string>& problems) {
  if (!preference) {
    patterns_.emplace_back(kDefaultPattern);
    return;
  }
  const ValueArray* consumers = preference->asArray();
  if (consumers == nullptr) {
    problems.push_back("it is no array of tables: " + preference->text());
    return;
  }
  for (std::size_t index = 0; index < consumers->size(); ++index) add((*consumers)[index], index, problems);
}

bool AnalyticsConsumers::wants(const std::string& eventName) const {
  return std::any_of(patterns_.begin(), patterns_.end(), [&](const std::string& pattern) {
    return fnmatch(pattern.c_str(), eventName.c_str(), 0) == 0;
  });
}

void AnalyticsConsumers::add(const Value& consumer, std::size_t index, std::vector<std::string>& problems) {
  const std::string place = "entry " + std::to_string(index + 1);
  const ValueMap* table = consumer.asMap();
  if (table == nullptr) {
    problems.push_back(place + " is no table: " + consumer.text());
    return;
  }
  const Value* name = table->find("name");
  if (name == nullptr || name->asString() == nullptr) {
    problems.push_back(place + " has no name");
    return;
  }
  const Value* events = table->find("events");
  if (events == nullptr || events->asArray() == nullptr) {
    problems.push_back(place + " (" + name->text() + ") has no array of events");
    return;
  }
  for (const Value& pattern : *events->asArray()) {
    if (pattern.asString() == nullptr) {
      problems.push_back(place + " (" + name->text() + ") has a pattern that is no text: " + pattern.text());
      continue;
    }
    patterns_.push_back(pattern.text());
  }
}

}  // namespace tonewerk
