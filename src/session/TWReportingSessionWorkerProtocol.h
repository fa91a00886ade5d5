// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>

namespace tonewerk {

class TWReportingSession;
struct TWReportingSessionWorkerClass;

// What turns a session's messages into one kind of report. A session has at most one worker of a class; it
// starts, feeds and stops it, always on the work queue:
//
//   made -> started -> [messages ...] -> stopped -> started again ...
//
// A class says what it is with a static `kWorkerClass` (TWReportingSessionWorkerClass.h).
class TWReportingSessionWorkerProtocol {
 public:
  virtual ~TWReportingSessionWorkerProtocol() = default;

  virtual const TWReportingSessionWorkerClass& workerClass() const = 0;

  // Whether the worker has started; none for a worker that has nothing to do at start, and so simply is.
  virtual std::optional<bool> start() { return std::nullopt; }
  virtual void stop() {}

  // The owner, which may be gone.
  std::weak_ptr<TWReportingSession> session;
  // Kept by the session.
  bool started = false;
};

}  // namespace tonewerk
