// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <vector>

namespace tonewerk {

class SessionDaemon;
class TimerService;

// One tracing session of LTTng's that records signposts. On the one thread that talks to the session daemon.
// Calls answer empty when all went well, else what did not. Each call to the session daemon is limited
// (CallLimit).
//
//   make() -> start() -> stop() -> destroy()
class LttngTrace {
 public:
  // `name` is the session's, unique in the session daemon; `directory` is absolute and empty. What is
  // referred to outlives the trace.
  LttngTrace(std::string name, std::string directory, SessionDaemon& daemon, TimerService& timers);
  LttngTrace(const LttngTrace&) = delete;
  LttngTrace& operator=(const LttngTrace&) = delete;
  // Destroys a session that was not.
  ~LttngTrace();

  // Records what programs of this device pass of these signposts.
  [[nodiscard]] std::string start(const std::set<std::string>& signposts);
  // Afterwards everything is on the disk.
  [[nodiscard]] std::string stop();
  // Also says what only shows now: a disk that was full, a writer that died, events that were lost.
  [[nodiscard]] std::string destroy();

  // Whether the tracepoints of this very process have reached the session daemon: if not, other programs'
  // need not have either.
  [[nodiscard]] static std::string checkThisProcessIsSeen(SessionDaemon& daemon, TimerService& timers);

 private:
  struct Handle;

  [[nodiscard]] std::string createSession();
  [[nodiscard]] std::string configure(const std::set<std::string>& signposts);
  [[nodiscard]] std::string enableChannel();
  [[nodiscard]] std::string addContexts();
  [[nodiscard]] std::string enableSignposts(const std::set<std::string>& signposts);
  [[nodiscard]] std::string countLosses();
  [[nodiscard]] std::string waitForData();
  template <typename Call>
  [[nodiscard]] int limited(Call call);

  const std::string name_;
  const std::string directory_;
  SessionDaemon& daemon_;
  TimerService& timers_;
  std::unique_ptr<Handle> handle_;  // null without a session
  std::uint64_t lostEvents_ = 0;
};

// Conditions in LTTng's filter language, of which each event of these signposts, and no other, meets one:
// several, because a long one is refused. No name holds a double quote, for which that language has no words.
std::vector<std::string> filtersFor(const std::set<std::string>& signposts);

}  // namespace tonewerk
