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

// Holds one message of a session, which a client sent or the daemon made.
//
// A session shares its records with its workers. They are changed only on the work queue. A worker that
// keeps a record beyond a call, or changes it, takes a copy.
class TWReportingSessionMessage {
 public:
  // The record shares the payload's values, but has a map of its own.
  TWReportingSessionMessage(ValueMap payload, AudioEventCategory messageCategory, AudioEventType messageType);

  // Returns a copy without the destination workers: a copy may go to any worker.
  std::shared_ptr<TWReportingSessionMessage> copyWithZone() const;

  // "category=Playback type=Start {...}"
  std::string description() const;

  // The "twreporting_timestamp" in seconds since 1970; 0 when there is none.
  double epochTime() const;

  // Sorts by epochTime(), ascending and stable. A time that is not a number counts as 0.
  static void sortMessages(std::vector<std::shared_ptr<TWReportingSessionMessage>>& messages);

  ValueMap message;
  AudioEventCategory category;
  AudioEventType type;
  bool isRedundant = false;
  bool isSessionStarted = false;
  // If not empty, only consumers of these classes get the message.
  std::vector<const TWReportingSessionWorkerClass*> destinationWorkers;

  // Locks this record. BasicLockable.
  void lock() const;
  void unlock() const;

 private:
  // Takes 1 byte instead of the 40 of a mutex; there is one in each stored message.
  mutable std::atomic_flag locked_;
};

using TWReportingSessionMessages = std::vector<std::shared_ptr<TWReportingSessionMessage>>;

}  // namespace tonewerk
