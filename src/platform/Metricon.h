// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

#include "values/UniqueFunction.h"
#include "values/Value.h"

namespace tonewerk {

// The analytics event service: records named events for whoever asked for them. Any thread.
class Metricon {
 public:
  virtual ~Metricon() = default;

  // Whether any analytics consumer has asked for events of this name.
  virtual bool isEventUsed(std::string_view name) = 0;

  // Records an event. `payload` is called at most once, before sendEvent() returns, and only when the event
  // is recorded. May wait while the recorder's queue is full (see docs/architecture.md, "Back pressure").
  virtual void sendEvent(const SharedString& name, const UniqueFunction<ValueMap()>& payload) = 0;
};

}  // namespace tonewerk
