// SPDX-License-Identifier: Apache-2.0
#include "tools/memory-usage/MemoryUsage.h"

namespace tonewerk {

MemoryUsage& MemoryUsage::operator+=(const MemoryUsage& other) {
  userSeconds += other.userSeconds;
  systemSeconds += other.systemSeconds;
  anonymous += other.anonymous;
  shared += other.shared;
  locked += other.locked;
  pinned += other.pinned;
  swapped += other.swapped;
  return *this;
}

}  // namespace tonewerk
