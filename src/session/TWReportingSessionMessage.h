// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

struct TWReportingSessionWorkerClass;

// One message of a session: what a client sent, or what the daemon made itself.
//
// A session's records are shared by its workers and changed only on the work queue. A worker that wants to
// keep one beyond a call, or change it, takes a copy.
class TWReportingSessionMessage {
 public:
  // The payload's values are shared, the map is the record's own.
  TWReportingSessionMessage(ValueMap payload, AudioEventCategory messageCategory, AudioEventType messageType);

  // A record of its own with everything but the destination workers: a copy may go to any.
  std::shared_ptr<TWReportingSessionMessage> copyWithZone() const;

  // "category=Playback type=Start {...}"
  std::string description() const;

  // Seconds since 1970 out of "twreporting_timestamp"; 0 without one.
  double epochTime() const;

  // Stable, ascending by epochTime(). One whose time is not a number counts as without time.
  static void sortMessages(std::vector<std::shared_ptr<TWReportingSessionMessage>>& messages);

  ValueMap message;
  AudioEventCategory category;
  AudioEventType type;
  bool isRedundant = false;
  bool isSessionStarted = false;
  // When not empty, only consumers of these classes get the message.
  std::vector<const TWReportingSessionWorkerClass*> destinationWorkers;

  // Excludes others from this record; BasicLockable.
  void lock() const;
  void unlock() const;

 private:
  mutable std::atomic_flag locked_;  // a byte instead of a mutex's forty: there is one a stored message
};

using TWReportingSessionMessages = std::vector<std::shared_ptr<TWReportingSessionMessage>>;

}  // namespace tonewerk
