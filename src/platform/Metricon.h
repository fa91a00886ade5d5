// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <concepts>
#include <cstdint>
#include <memory>
#include <optional>
#include <utility>

#include "protocol/AudioEvent.h"
#include "values/FunctionRef.h"
#include "values/SharedString.h"
#include "values/Value.h"

namespace tonewerk {

// What one event is called: one name, or two where a framework and a service each have a name for it.
struct EventNames {
  EventNames() = default;
  // Implicit: a text is the name of an event that has one.
  template <std::convertible_to<SharedString> Name>
  EventNames(const Name& name) : first(name) {}
  EventNames(SharedString firstName, SharedString secondName)
      : first(std::move(firstName)), second(std::move(secondName)) {}

  friend bool operator==(const EventNames&, const EventNames&) = default;

  SharedString first;
  SharedString second;  // empty when the event has one name
};

struct SessionLife;

enum class EventSource : std::uint8_t {
  kUnknown,  // the event is no message
  kClient,   // a client has sent the message
  kDerived,  // the daemon has made it
};

// A stretch of time, in seconds since 1970.
struct TimeStretch {
  double began = 0.0;
  double ended = 0.0;

  friend bool operator==(const TimeStretch&, const TimeStretch&) = default;
};

// What an event is about, kept beside its payload.
struct EventSubject {
  AudioEventCategory category = kCategoryUnknown;
  AudioEventType type = kTypeUnknown;
  EventSource source = EventSource::kUnknown;  // kUnknown leaves out category and type
  std::shared_ptr<SessionLife> life = {};      // of the message's session; null for none
  std::optional<TimeStretch> stretch = {};     // which a summary sums up
};

// The analytics event service: records named events for consumers that asked for them. Any thread.
class Metricon {
 public:
  virtual ~Metricon() = default;

  // Records an event under those of its names that a consumer has asked for, the first name first. `payload`
  // is called once, before sendEvent() returns, and not at all when nobody has asked for any of the names.
  // Waits while the recorder's queue is full, unless nothing can be written (see docs/architecture.md, "Back
  // pressure").
  virtual void sendEvent(const EventNames& names, const EventSubject& subject,
                         FunctionRef<ValueMap()> payload) = 0;
};

}  // namespace tonewerk
