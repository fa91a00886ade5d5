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

// One tracing session of LTTng that records signposts. Only the thread that talks to the session daemon may
// use it. The functions return an empty text if they succeed, otherwise the problem. CallLimit limits the
// time of each call to the session daemon.
//
//   LttngTrace() -> start() -> stop() -> destroy()
class LttngTrace {
 public:
  // `name` is the name of the session, unique in the session daemon. `directory` is an absolute path of an
  // empty directory. The references must outlive the trace.
  LttngTrace(std::string name, std::string directory, SessionDaemon& daemon, TimerService& timers);
  LttngTrace(const LttngTrace&) = delete;
  LttngTrace& operator=(const LttngTrace&) = delete;
  // Calls destroy() if it was not called.
  ~LttngTrace();

  // Starts recording these signposts in all programs on this device.
  [[nodiscard]] std::string start(const std::set<std::string>& signposts);
  // Stops recording. When it has returned, all events are on the disk.
  [[nodiscard]] std::string stop();
  // Destroys the session. It also reports problems that are known only now: a full disk, a dead writer
  // process, or lost events.
  [[nodiscard]] std::string destroy();

  // Waits until the session daemon knows the tracepoints of this process. If it does not, it may not know
  // those of other programs either.
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

// Filters in LTTng's language. Each event of these signposts matches exactly one of them, and no other event
// matches. There are several, because LTTng refuses a long filter. The names must not contain a double quote,
// which the language cannot express.
std::vector<std::string> filtersFor(const std::set<std::string>& signposts);

}  // namespace tonewerk
