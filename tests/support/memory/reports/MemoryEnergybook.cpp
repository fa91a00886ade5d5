// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemoryEnergybook.h"

#include <utility>

namespace tonewerk {

void MemoryEnergybook::sendEvent(std::int32_t group, const SharedString& name, ValueMap payload) {
  const MutexLock lock(mutex_);
  events_.push_back({group, name.string(), std::move(payload)});
}

std::vector<MemoryEnergybook::Event> MemoryEnergybook::events() const {
  const MutexLock lock(mutex_);
  return events_;
}

}  // namespace tonewerk
