// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cassert>
#include <memory>
#include <vector>

#include "session/TWReportingUtility.h"

namespace tonewerk {

class TapSubscriber;
class TWReportingSession;
class TWReportingSessionMessage;

// Who watches the messages that clients send. Those that the daemon derives itself are not shown: they appear
// where they go, in the reports. On the work queue.
class MessageTap {
 public:
  // Held weakly: a watcher goes with its connection. Once is enough.
  void add(const std::shared_ptr<TapSubscriber>& watcher);

  // `message` has been received, judged and delivered by `session`.
  void note(const TWReportingSession& session, const TWReportingSessionMessage& message) {
    assert(TWReportingUtilityIsOnReportingServerQueue());
    if (!watchers_.empty()) offer(session, message);
  }

 private:
  void offer(const TWReportingSession& session, const TWReportingSessionMessage& message);

  std::vector<std::weak_ptr<TapSubscriber>> watchers_;
};

}  // namespace tonewerk
