// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// What came back for a request: an error, or a result (none for nil).
struct Answer {
  std::optional<ReplyError> error;
  std::optional<Value> result;
};

// One connection to the reporting daemon, for one thread.
//
// Requests are answered in the order in which they complete; a start's answer only comes with the session's
// stop, so answers go to handlers. Handlers run inside processAnswers() and call(), never inside request().
class ReportingClient {
 public:
  using AnswerHandler = std::function<void(const Answer& answer)>;

  ReportingClient();
  ReportingClient(const ReportingClient&) = delete;
  ReportingClient& operator=(const ReportingClient&) = delete;
  ~ReportingClient();

  // Where a daemon may listen, in the order in which to try: TONEWERK_REPORTING_SOCKET alone when it is set,
  // else the caller's own runtime directory, then the system's.
  static std::vector<std::string> socketPaths();

  // Connects to the first path on which somebody listens. An earlier connection is closed first; handlers
  // still waiting are dropped. The error is that of the last path tried.
  [[nodiscard]] std::error_code connect(const std::vector<std::string>& paths = socketPaths());
  void disconnect();
  bool isConnected() const;
  // The path that connect() last connected to; empty before.
  const std::string& socketPath() const { return socketPath_; }

  // For poll(): readable when answers wait or the daemon is gone. -1 when not connected.
  int fileDescriptor() const;

  // Sends a request. Waits, at most the send time-out (10 s unless set), while the daemon reads nothing; a
  // failure ends the connection, and handlers still waiting are dropped.
  [[nodiscard]] std::error_code request(std::string_view method, const Arguments& arguments,
                                        AnswerHandler handler);
  // The same without an answer.
  [[nodiscard]] std::error_code notify(std::string_view method, const Arguments& arguments);
  void setSendTimeout(std::chrono::milliseconds timeout);

  // Waits up to `timeout` for something to arrive, then runs the handlers of all answers that are there.
  // Fails when the connection is gone; std::errc::timed_out when nothing came (with a zero time-out: no
  // error).
  [[nodiscard]] std::error_code processAnswers(std::chrono::milliseconds timeout);

  // Sends a request and waits for its answer; handlers of others that arrive before it run. None on failure
  // or after `timeout`; `error` says which.
  std::optional<Answer> call(std::string_view method, const Arguments& arguments,
                             std::chrono::milliseconds timeout, std::error_code& error);

  // The message request's arguments. `reporterIDs` empty means nil: every started session.
  static Arguments messageArguments(ValueMap message, std::uint32_t category, std::uint16_t type,
                                    const std::vector<std::int64_t>& reporterIDs);

 private:
  struct Connection;

  std::error_code send(std::string_view frame);

  std::shared_ptr<Connection> connection_;  // shared with processAnswers(), whose handlers may disconnect
  std::string socketPath_;
  std::chrono::milliseconds sendTimeout_{10'000};
};

}  // namespace tonewerk
