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

void StoreMetricon::sendEvent(const EventNames& names, const EventSubject& subject,
                              FunctionRef<ValueMap()> payload) {
  std::optional<EventNames> used = usedOf(names);
  if (used) store_.recordEvent(clock_.now(), std::move(*used), payload(), subject);
}

std::optional<EventNames> StoreMetricon::usedOf(const EventNames& names) {
  const MutexLock lock(mutex_);
  readConsumers();
  const auto known = remembered_.find(names);
  const EventNames& used = known == remembered_.end() ? remember(names) : known->second;
  return used.first.empty() ? std::nullopt : std::optional(used);
}

const EventNames& StoreMetricon::remember(const EventNames& names) {
  EventNames used;
  if (consumers_->wants(names.first.string())) used.first = names.first;
  if (!names.second.empty() && consumers_->wants(names.second.string())) {
    (used.first.empty() ? used.first : used.second) = names.second;
  }
  if (remembered_.size() >= kMaxRemembered) remembered_.clear();
  return remembered_.emplace(names, std::move(used)).first->second;
}

void StoreMetricon::readConsumers() {
  const std::chrono::nanoseconds now = clock_.coarseMonotonic();
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
