// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>

namespace tonewerk {

class TWReportingSession;
class TWReportingSessionWorkerConsumerProtocol;
struct TWReportingSessionWorkerClass;

// Turns a session's messages into one kind of report. A session has at most one worker of a class. It
// starts the worker, gives it messages and stops it, always on the work queue:
//
//   made -> started -> [messages ...] -> stopped -> started again ...
//
// Each class describes itself in a static `kWorkerClass` (TWReportingSessionWorkerClass.h).
class TWReportingSessionWorkerProtocol {
 public:
  virtual ~TWReportingSessionWorkerProtocol() = default;

  virtual const TWReportingSessionWorkerClass& workerClass() const = 0;

  // Returns whether the worker has started. None means that the worker has nothing to do at start; it
  // counts as started.
  virtual std::optional<bool> start() { return std::nullopt; }
  virtual void stop() {}

  // Returns the worker as a consumer; null when it is none. Faster than a cast, which a session would make
  // for each consumer.
  virtual TWReportingSessionWorkerConsumerProtocol* asConsumer() { return nullptr; }

  // The session that owns the worker; it may be gone.
  std::weak_ptr<TWReportingSession> session;
  // Set by the session.
  bool started = false;
};

}  // namespace tonewerk
