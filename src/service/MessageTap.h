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

// Shows the messages that clients send to the clients that watch them. Messages that the daemon derives are
// not shown; they appear in the reports. Used on the work queue.
class MessageTap {
 public:
  // Adds a watcher, unless it was added before. Holds it weakly, because it ends with its connection.
  void add(const std::shared_ptr<TapSubscriber>& watcher);

  // Shows a message that `session` has received, marked as redundant or not, and delivered.
  void note(const TWReportingSession& session, const TWReportingSessionMessage& message) {
    assert(TWReportingUtilityIsOnReportingServerQueue());
    if (!watchers_.empty()) offer(session, message);
  }

 private:
  void offer(const TWReportingSession& session, const TWReportingSessionMessage& message);

  std::vector<std::weak_ptr<TapSubscriber>> watchers_;
};

}  // namespace tonewerk
