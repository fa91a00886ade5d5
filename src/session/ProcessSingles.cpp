// SPDX-License-Identifier: Apache-2.0
#include "session/ProcessSingles.h"

namespace tonewerk {

ProcessSingles::~ProcessSingles() {
  while (!objects_.empty()) objects_.pop_back();
}

ProcessSingles::Slot& ProcessSingles::slotOf(std::type_index type) {
  const std::lock_guard lock(mutex_);
  return slots_[type];
}

void ProcessSingles::keep(Slot& slot, std::shared_ptr<void> object) {
  const std::lock_guard lock(mutex_);
  slot.object = object.get();
  objects_.push_back(std::move(object));
}

}  // namespace tonewerk
