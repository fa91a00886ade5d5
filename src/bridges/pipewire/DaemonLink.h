// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "bridges/pipewire/Diagnostics.h"
#include "bridges/pipewire/EventLoop.h"
#include "bridges/pipewire/RetryDelay.h"
#include "bridges/pipewire/SessionSink.h"
#include "client/ReportingClient.h"

namespace tonewerk {

// The connection to the reporting daemon, made again whenever it breaks.
//
//   open()    connect -- no daemon --> wait, longer each time --> connect ...
//                |
//             onConnected: users begin their sessions anew; nothing of an earlier connection is left
//                |
//             requests -- broken or full --> wait --> connect ...
//
// While there is no daemon, requests are swallowed and nothing is kept. A daemon that does not read holds the
// thread for at most kSendTimeout, once: the connection then counts as broken.
//
// For the loop's thread.
class DaemonLink final : public SessionSink {
 public:
  static constexpr std::chrono::milliseconds kSendTimeout{250};

  // `paths` as ReportingClient::connect() takes them. `loop` and `diagnostics` outlive this.
  DaemonLink(EventLoop& loop, const Diagnostics& diagnostics, std::vector<std::string> paths);

  // Called once. `onConnected` must not destroy this.
  void open(std::function<void()> onConnected);
  bool isConnected() const { return client_.isConnected(); }
  // The daemon's socket; valid while connected.
  const std::string& socketPath() const { return client_.socketPath(); }

  // Waits, at most `timeout`, until the daemon has done what it was asked. False when it has not.
  bool finish(std::chrono::milliseconds timeout);

  void create(std::int64_t reporterID) override;
  void configure(std::int64_t reporterID, std::uint16_t serviceType, const ValueMap& configuration) override;
  void start(std::int64_t reporterID) override;
  void message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
               ValueMap message) override;
  void stop(std::int64_t reporterID) override;
  void destroy(std::int64_t reporterID) override;

 private:
  void connect();
  void processAnswers();
  void request(const char* method, const Arguments& arguments);
  void reportRefusal(const char* method, const ReplyError& error);
  void lost(const std::error_code& error);

  EventLoop& loop_;
  const Diagnostics& diagnostics_;
  const std::vector<std::string> paths_;
  std::function<void()> onConnected_;
  ReportingClient client_;
  RetryDelay retryDelay_;
  bool saidAbsent_ = false;
  std::string lastRefusal_;  // said once, however often it comes in a row
  std::unique_ptr<EventLoop::Timer> retryTimer_;
  std::unique_ptr<EventLoop::Source> answers_;  // while connected
};

}  // namespace tonewerk
