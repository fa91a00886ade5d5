// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryMetricon.h"

#include <fnmatch.h>

namespace tonewerk {

void MemoryMetricon::sendEvent(const EventNames& names, const EventSubject& subject,
                               FunctionRef<ValueMap()> payload) {
  std::vector<std::string> used = usedOf(names);
  if (used.empty()) return;
  const ValueMap made = payload();
  const MutexLock lock(mutex_);
  for (std::string& name : used) events_.push_back({std::move(name), made, subject});
}

std::vector<std::string> MemoryMetricon::usedOf(const EventNames& names) const {
  const MutexLock lock(mutex_);
  std::vector<std::string> used;
  for (const SharedString* name : {&names.first, &names.second}) {
    if (!name->empty() && isUsed_(*name)) used.push_back(name->string());
  }
  return used;
}

void MemoryMetricon::useOnly(std::vector<std::string> patterns) {
  useOnly([held = std::move(patterns)](std::string_view name) {
    for (const std::string& pattern : held) {
      if (fnmatch(pattern.c_str(), std::string(name).c_str(), 0) == 0) return true;
    }
    return false;
  });
}

void MemoryMetricon::useOnly(std::function<bool(std::string_view name)> isUsed) {
  const MutexLock lock(mutex_);
  isUsed_ = std::move(isUsed);
}

std::vector<MemoryMetricon::Event> MemoryMetricon::events() const {
  const MutexLock lock(mutex_);
  return events_;
}

std::vector<std::string> MemoryMetricon::names() const {
  std::vector<std::string> names;
  for (const Event& event : events()) names.push_back(event.name);
  return names;
}

std::vector<ValueMap> MemoryMetricon::eventsNamed(std::string_view name) const {
  std::vector<ValueMap> payloads;
  for (const Event& event : events()) {
    if (event.name == name) payloads.push_back(event.payload);
  }
  return payloads;
}

void MemoryMetricon::clear() {
  const MutexLock lock(mutex_);
  events_.clear();
}

}  // namespace tonewerk
