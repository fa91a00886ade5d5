// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>

namespace tonewerk {

// What went wrong, in words; none when nothing did.
using RuntraceError = std::optional<std::string>;

// Keeps a finished trace's files: they go with its last copy.
using RuntraceToken = std::shared_ptr<void>;

// Hears of a trace session's course, on threads of the service's or from inside the call that asks.
//
//   startRuntrace() -> runtraceDidStart() -> stopRuntrace() -> runtraceDidStop() -> runtraceDidComplete()
//
// An error ends the course; which call brings it depends on where the service noticed. A trace that breaks
// while it runs completes with an error, unasked.
class RuntraceSessionDelegate {
 public:
  virtual ~RuntraceSessionDelegate() = default;

  virtual void runtraceDidStart(const RuntraceError& error) = 0;
  virtual void runtraceDidStop(const RuntraceError& error) = 0;
  // `traceLocation` is an absolute path, empty with an error; `token` is then null.
  virtual void runtraceDidComplete(const std::string& traceLocation, const RuntraceToken& token,
                                   const RuntraceError& error) = 0;
};

// What to trace: the signposts that a probe list names.
struct RuntraceConfiguration {
  std::string probeListPath;
  // Packs the finished trace; a service that cannot leaves it as it is.
  bool compressesFinishedTrace = true;
};

// One trace, from its start to its completion. Any thread; no call waits for the service.
//
// Destroying it, which a callback may do, gives up a trace that has not completed.
class RuntraceSession {
 public:
  virtual ~RuntraceSession() = default;

  // Not kept alive. When this has returned the delegate before is not called any more, and no call of it
  // still runs, unless this was called from inside one.
  virtual void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) = 0;

  // Once.
  virtual void startRuntrace() = 0;
  // Does nothing for a session that was not started or has ended.
  virtual void stopRuntrace() = 0;

  // Until it has failed or completed.
  virtual bool isValid() const = 0;
};

// The performance-trace service: it records when signposts of the device's programs begin and end. Any
// thread.
class Runtrace {
 public:
  virtual ~Runtrace() = default;

  // Never null; what is wrong with the configuration or the service, the start's callback says.
  [[nodiscard]] virtual std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) = 0;
};

}  // namespace tonewerk
