// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreMetricon.h"

#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/linux/store/ReportStore.h"

namespace tonewerk {

StoreMetricon::StoreMetricon(ReportStore& store, const PreferenceStore& preferences, const Clock& clock,
                             const LogCategory& log)
    : store_(store), preferences_(preferences), clock_(clock), log_(log) {}

StoreMetricon::~StoreMetricon() = default;

void StoreMetricon::readConsumersAgain() {
  const MutexLock lock(mutex_);
  isStale_ = true;
}

void StoreMetricon::sendEvent(const EventNames& names, const UniqueFunction<ValueMap()>& payload) {
  EventNames used = usedOf(names);
  if (used.first.empty()) return;
  store_.recordEvent(clock_.now(), std::move(used), payload());
}

EventNames StoreMetricon::usedOf(const EventNames& names) {
  const MutexLock lock(mutex_);
  readConsumers();
  const auto known = remembered_.find(names);
  if (known != remembered_.end()) return known->second;
  EventNames used;
  if (consumers_->wants(names.first.string())) used.first = names.first;
  if (!names.second.empty() && consumers_->wants(names.second.string())) {
    (used.first.empty() ? used.first : used.second) = names.second;
  }
  if (remembered_.size() >= kMaxRemembered) remembered_.clear();
  remembered_.emplace(names, used);
  return used;
}

void StoreMetricon::readConsumers() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (!std::exchange(isStale_, false) && now - readAt_ < kReadInterval) return;
  readAt_ = now;
  std::optional<Value> preference = preferences_.read(kPreferenceDomain, kConsumersKey);
  if (consumers_ && preference == preference_) return;
  std::vector<std::string> problems;
  consumers_.emplace(preference, problems);
  preference_ = std::move(preference);
  remembered_.clear();
  for (const std::string& problem : problems) {
    errorLog(log_, "%s of %s: %s; it is left out", kConsumersKey, kPreferenceDomain, problem);
  }
}

}  // namespace tonewerk
