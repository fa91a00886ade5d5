// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <sys/types.h>

#include "values/Mutex.h"

namespace tonewerk {

class LogCategory;

// Provides LTTng's session daemon. If one is running that this user's programs connect to, that one is used.
// Otherwise a private one is started when it is first needed, and again when it has ended.
//
// Only the thread that talks to the session daemon may call the functions, unless they say otherwise. The
// kernel kills the private session daemon when that thread ends.
class SessionDaemon {
 public:
  // The private session daemon writes its errors to the file `logPath`. `log` must outlive this object.
  SessionDaemon(std::string logPath, const LogCategory& log);
  SessionDaemon(const SessionDaemon&) = delete;
  SessionDaemon& operator=(const SessionDaemon&) = delete;
  // Ends the private session daemon.
  ~SessionDaemon();

  // Starts a session daemon if necessary. Empty if one is running and answers, otherwise the problem.
  [[nodiscard]] std::string ensureRunning();

  // Whether a private session daemon is in use.
  bool isPrivate() const;
  // Asks the private session daemon to end, and kills it if that takes too long.
  void end();
  // Any thread. Kills the private session daemon, so that calls that wait for its answer fail.
  void kill();

 private:
  [[nodiscard]] std::string startPrivate();
  [[nodiscard]] std::string waitUntilItAnswers();
  bool hasEnded();
  std::string lastLogLine() const;

  const std::string logPath_;
  const LogCategory& log_;
  mutable Mutex mutex_;
  pid_t process_ GUARDED_BY(mutex_) = 0;  // of the private one until waitpid(); 0 for none
};

}  // namespace tonewerk
