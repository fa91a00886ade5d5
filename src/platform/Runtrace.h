// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>

namespace tonewerk {

// What went wrong, in words; none when nothing did.
using RuntraceError = std::optional<std::string>;

// Keeps the files of a finished trace: they are removed with the last copy of the token.
using RuntraceToken = std::shared_ptr<void>;

// Learns of the progress of a trace session, on threads of the service or inside the call that causes it.
//
//   startRuntrace() -> runtraceDidStart() -> stopRuntrace() -> runtraceDidStop() -> runtraceDidComplete()
//
// An error ends the session; which function reports it depends on where the service noticed it. A trace that
// fails while it runs completes with an error without being stopped.
class RuntraceSessionDelegate {
 public:
  virtual ~RuntraceSessionDelegate() = default;

  virtual void runtraceDidStart(const RuntraceError& error) = 0;
  virtual void runtraceDidStop(const RuntraceError& error) = 0;
  // `traceLocation` is an absolute path. With an error it is empty and `token` is null.
  virtual void runtraceDidComplete(const std::string& traceLocation, const RuntraceToken& token,
                                   const RuntraceError& error) = 0;
};

// What to trace: the signposts that a probe list names.
struct RuntraceConfiguration {
  std::string probeListPath;
  // Compresses the finished trace. A service that cannot compress leaves it unchanged.
  bool compressesFinishedTrace = true;
};

// Controls one trace, from its start to its completion. Any thread; no call waits for the service.
//
// Destroying it, which a callback may do, abandons a trace that has not completed.
class RuntraceSession {
 public:
  virtual ~RuntraceSession() = default;

  // Does not keep the delegate alive. After it returns no call of the previous delegate begins or still runs;
  // called from inside such a call, it does not wait for that call.
  virtual void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) = 0;

  // Call once.
  virtual void startRuntrace() = 0;
  // Does nothing for a session that was not started or has ended.
  virtual void stopRuntrace() = 0;

  // Returns true until the session has failed or completed.
  virtual bool isValid() const = 0;
};

// The performance-trace service records when signposts of the device's programs begin and end. Any thread.
class Runtrace {
 public:
  virtual ~Runtrace() = default;

  // Never returns null. A problem with the configuration or the service is reported by the callback of the
  // start.
  [[nodiscard]] virtual std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) = 0;
};

}  // namespace tonewerk
