// SPDX-License-Identifier: Apache-2.0
#include "service/MessageTap.h"

#include <algorithm>
#include <cassert>

#include "service/TapSubscriber.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

void MessageTap::add(const std::shared_ptr<TapSubscriber>& watcher) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto isListed = [&](const auto& listed) { return listed.lock() == watcher; };
  if (std::none_of(watchers_.begin(), watchers_.end(), isListed)) watchers_.push_back(watcher);
}

void MessageTap::offer(const TWReportingSession& session, const TWReportingSessionMessage& message) {
  bool hasExpired = false;
  for (const auto& listed : watchers_) {
    const auto watcher = listed.lock();
    hasExpired = hasExpired || watcher == nullptr;
    if (watcher != nullptr) watcher->offer(session, message);
  }
  if (hasExpired) std::erase_if(watchers_, [](const auto& listed) { return listed.expired(); });
}

}  // namespace tonewerk
