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

// Sends sessions and messages to the reporting daemon through the client library, which connects and
// reconnects by itself.
//
//   open()    no daemon yet: all calls are ignored
//                |
//             onConnected(kFirst): users begin their sessions
//                |
//             the daemon goes away: messages wait, up to the library's limit
//                |
//             onConnected(kAgain): the library has made the sessions again. The old daemon's messages are
//                                  lost, so users send their present state
//
// Only finish() waits. All calls are made on the loop's thread, and all callbacks run on it.
class DaemonLink final : public SessionSink {
 public:
  enum class Connection { kFirst, kAgain };

  // An empty `socketPath` means the daemon's usual socket. `loop` and `console` outlive this object.
  DaemonLink(EventLoop& loop, const Console& console, std::string socketPath = {});
  DaemonLink(const DaemonLink&) = delete;
  DaemonLink& operator=(const DaemonLink&) = delete;
  ~DaemonLink() override;

  // Must be called once. `onConnected` must not destroy this object. False when the system has no memory or
  // no descriptors.
  [[nodiscard]] bool open(std::function<void(Connection connection)> onConnected);
  bool isConnected() const { return isConnected_; }
  // The socket of the current or the latest connection; empty before the first one.
  std::string socketPath() const;

  // Waits at most `timeout` until the daemon has served all requests. False when it has not, or is not
  // connected.
  [[nodiscard]] bool finish(std::chrono::milliseconds timeout);

  void create(std::int64_t reporterID) override;
  void configure(std::int64_t reporterID, std::uint16_t serviceType, const ValueMap& configuration) override;
  void start(std::int64_t reporterID) override;
  void message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
               ValueMap message) override;
  void stop(std::int64_t reporterID) override;
  void destroy(std::int64_t reporterID) override;

 private:
  struct PendingRequest;

  twr_client_info info() const;
  twr_session* session(std::int64_t reporterID) const;
  void reportUnsendable(const char* method, twr_status status) const;
  // Runs `call`, which makes a request with the given reply function and context. The reply reports a
  // refusal.
  template <class Call>
  void request(const char* method, Call call);
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
  bool hasReportedAbsence_ = false;
  std::string lastRefusal_;  // a refusal that equals the last one is not reported
  LoopInbox inbox_;
  twr_client* client_ = nullptr;                   // posts to the inbox until it is destroyed
  std::map<std::int64_t, twr_session*> sessions_;  // owned by client_
};

}  // namespace tonewerk
