// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "values/Value.h"

namespace tonewerk {

// Records events in the power log; they explain what used the battery. Any thread.
class Energybook {
 public:
  virtual ~Energybook() = default;

  // Records an event that is registered under this group and name. May wait while the recorder's queue is
  // full (see docs/architecture.md, "Back pressure").
  virtual void sendEvent(std::int32_t group, const SharedString& name, ValueMap payload) = 0;
};

}  // namespace tonewerk
