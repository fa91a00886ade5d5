// SPDX-License-Identifier: Apache-2.0
#include "session/SingletonRegistry.h"

namespace tonewerk {

SingletonRegistry::~SingletonRegistry() {
  while (!objects_.empty()) objects_.pop_back();
}

SingletonRegistry::Slot& SingletonRegistry::slotOf(std::type_index type) {
  const MutexLock lock(mutex_);
  return slots_[type];
}

void SingletonRegistry::keep(Slot& slot, std::shared_ptr<void> object) {
  const MutexLock lock(mutex_);
  slot.object = object.get();
  objects_.push_back(std::move(object));
}

}  // namespace tonewerk
