// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <string>

#include "bridges/pipewire/Console.h"
#include "bridges/pipewire/LoopInbox.h"
#include "bridges/pipewire/sessions/SessionSink.h"
#include "tonewerk/reporting.h"

namespace tonewerk {

// The way to the reporting daemon: the client library, whose connection comes and goes by itself.
//
//   open()    no daemon yet: everything is swallowed
//                |
//             onConnected(kFirst): users begin their sessions
//                |
//             the daemon goes: what is said waits, up to the library's bound
//                |
//             onConnected(kAgain): the library has made the sessions again. What they had been told before is
//                                  gone with the old daemon, so users tell how things stand
//
// Nothing here waits but finish(). For the loop's thread, on which everything is called back, too.
class DaemonLink final : public SessionSink {
 public:
  enum class Connection { kFirst, kAgain };

  // `socketPath` empty: where the daemon usually is. `loop` and `console` outlive this.
  DaemonLink(EventLoop& loop, const Console& console, std::string socketPath = {});
  DaemonLink(const DaemonLink&) = delete;
  DaemonLink& operator=(const DaemonLink&) = delete;
  ~DaemonLink() override;

  // Called once. `onConnected` must not destroy this. False without memory or descriptors.
  [[nodiscard]] bool open(std::function<void(Connection connection)> onConnected);
  bool isConnected() const { return isConnected_; }
  // Where the daemon is, or was last; empty before the first connection.
  std::string socketPath() const;

  // Waits, at most `timeout`, until the daemon has done what it was asked. False when it has not.
  [[nodiscard]] bool finish(std::chrono::milliseconds timeout);

  void create(std::int64_t reporterID) override;
  void configure(std::int64_t reporterID, std::uint16_t serviceType, const ValueMap& configuration) override;
  void start(std::int64_t reporterID) override;
  void message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
               ValueMap message) override;
  void stop(std::int64_t reporterID) override;
  void destroy(std::int64_t reporterID) override;

 private:
  struct Asked;

  twr_client_info info() const;
  twr_session* session(std::int64_t reporterID) const;
  // `call` makes a request with a reply that reports a refusal.
  template <class Call>
  void ask(const char* method, Call call);
  static void answered(void* context, const twr_answer* answer);
  static void stateChanged(void* context, twr_state state);
  void changed(twr_state state, int error);
  void connected();
  void reportRefusal(const std::string& refusal);

  const Console& console_;
  const std::string chosenPath_;
  std::function<void(Connection connection)> onConnected_;
  bool isConnected_ = false;
  bool wasConnected_ = false;
  bool saidAbsent_ = false;
  std::string lastRefusal_;  // said once, however often it comes in a row
  LoopInbox inbox_;
  twr_client* client_ = nullptr;                   // puts into the inbox until it is destroyed
  std::map<std::int64_t, twr_session*> sessions_;  // the client's
};

}  // namespace tonewerk
