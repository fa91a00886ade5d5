// SPDX-License-Identifier: Apache-2.0
#include "support/memory/reports/MemorySessionBook.h"

namespace tonewerk {

void MemorySessionBook::enter(const std::shared_ptr<SessionLife>& life, const SharedString& application,
                              const SharedString& process, const std::optional<SessionEnd>& end) {
  const MutexLock lock(mutex_);
  entries_.push_back({life, application.string(), process.string(), end});
}

std::vector<MemorySessionBook::Entry> MemorySessionBook::entries() const {
  const MutexLock lock(mutex_);
  return entries_;
}

}  // namespace tonewerk
