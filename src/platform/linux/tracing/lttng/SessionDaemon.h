// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <sys/types.h>

#include "values/Mutex.h"

namespace tonewerk {

class LogCategory;

// LTTng's session daemon: the one that runs where this user's programs look for it, or else a private one,
// started when it is first needed, and again when it has ended.
//
// One thread, the one that talks to it, unless a member says otherwise. The private one ends with that
// thread.
class SessionDaemon {
 public:
  // What the private one has to say goes to `logPath`.
  SessionDaemon(std::string logPath, const LogCategory& log);
  SessionDaemon(const SessionDaemon&) = delete;
  SessionDaemon& operator=(const SessionDaemon&) = delete;
  // Ends the private one.
  ~SessionDaemon();

  // Empty when one runs and answers, else why none does.
  [[nodiscard]] std::string ensureRunning();

  // Whether the one in use was started here.
  bool isPrivate() const;
  // Ends the private one in order; at once when it takes more than some seconds.
  void end();
  // Any thread: ends the private one at once, which frees whoever waits for its answer.
  void kill();

 private:
  [[nodiscard]] std::string startPrivate();
  [[nodiscard]] std::string waitUntilItAnswers();
  bool hasEnded();
  std::string lastWords() const;

  const std::string logPath_;
  const LogCategory& log_;
  mutable Mutex mutex_;
  pid_t process_ GUARDED_BY(mutex_) = 0;  // the private one, not yet reaped; 0 for none
};

}  // namespace tonewerk
