// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>
#include <string_view>
#include <unordered_map>

#include "platform/Metricon.h"
#include "platform/linux/store/AnalyticsConsumers.h"
#include "platform/linux/store/StoreRow.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;
class LogCategory;
class PreferenceStore;
class ReportStore;

// The analytics event service over the report store. An event is one row, whatever the number of its names
// and of the consumers that ask for it.
//
// The consumers are read from the preferences, again at most once a second of the monotonic clock, so a
// change takes effect within a second. Entries that cannot be read are left out, and logged once until the
// preference changes.
class StoreMetricon final : public Metricon {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.metricon";
  static constexpr std::string_view kConsumersKey = "consumers";

  // All references outlive it.
  StoreMetricon(ReportStore& store, const PreferenceStore& preferences, const Clock& clock,
                const LogCategory& log);
  ~StoreMetricon() override;

  // Any thread. The next event reads the preference again.
  void readConsumersAgain();

  void sendEvent(const EventNames& names, const EventSubject& subject,
                 FunctionRef<ValueMap()> payload) override;

 private:
  static constexpr std::chrono::seconds kReadInterval{1};
  // The answers for so many names are remembered. When there are more, all are forgotten.
  static constexpr std::size_t kMaxRemembered = 4096;

  // The names that a consumer asks for, if there are any.
  std::optional<EventNames> usedOf(const EventNames& names);
  // Adds the answer for these names to remembered_.
  const EventNames& remember(const EventNames& names) REQUIRES(mutex_);
  void readConsumers() REQUIRES(mutex_);

  ReportStore& store_;
  const PreferenceStore& preferences_;
  const Clock& clock_;
  const LogCategory& log_;

  Mutex mutex_;
  std::optional<AnalyticsConsumers> consumers_ GUARDED_BY(mutex_);
  std::optional<Value> preference_ GUARDED_BY(mutex_);  // consumers_ was made of this
  std::chrono::nanoseconds readAt_ GUARDED_BY(mutex_){0};
  bool isStale_ GUARDED_BY(mutex_) = true;
  // Which of an event's names consumers_ ask for; `first` is empty when that is none.
  std::unordered_map<EventNames, EventNames, EventNamesHash> remembered_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
