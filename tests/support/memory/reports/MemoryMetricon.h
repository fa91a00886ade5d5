// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "platform/Metricon.h"
#include "values/Mutex.h"

namespace tonewerk {

// Keeps the events that were recorded. Every event is used until the test limits them. Any thread.
//
//   metricon.useOnly({"com.orvane.audio.*"});
//   EXPECT_THAT(metricon.eventsNamed("com.orvane.audio.volume"), SizeIs(1));
class MemoryMetricon final : public Metricon {
 public:
  struct Event {
    std::string name;
    ValueMap payload;
    EventSubject subject;
  };

  // Keeps one event for each name that is used.
  void sendEvent(const EventNames& names, const EventSubject& subject,
                 FunctionRef<ValueMap()> payload) override;

  // After this only events are used that match one of the glob patterns, or the predicate.
  void useOnly(std::vector<std::string> patterns);
  void useOnly(std::function<bool(std::string_view name)> isUsed);

  std::vector<Event> events() const;
  std::vector<std::string> names() const;
  // The payloads of the events of this name.
  std::vector<ValueMap> eventsNamed(std::string_view name) const;
  void clear();

 private:
  std::vector<std::string> usedOf(const EventNames& names) const;

  mutable Mutex mutex_;
  std::function<bool(std::string_view name)> isUsed_ GUARDED_BY(mutex_) = [](std::string_view) {
    return true;
  };
  std::vector<Event> events_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
