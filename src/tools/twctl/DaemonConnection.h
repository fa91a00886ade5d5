// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
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

// One connection to the daemon through the client library, for one thread: the library's answers, which come
// on a thread of its own, wait until they are asked for.
//
// Handlers run inside processAnswers() and call(), never inside request().
class DaemonConnection {
 public:
  // What came back for a request: an error, or a result (none for nil).
  struct Answer {
    std::optional<ReplyError> error;
    std::optional<Value> result;
  };
  using AnswerHandler = std::function<void(const Answer& answer)>;

  DaemonConnection();
  DaemonConnection(const DaemonConnection&) = delete;
  DaemonConnection& operator=(const DaemonConnection&) = delete;
  // Handlers still waiting are dropped.
  ~DaemonConnection();

  // Connects to the first path on which somebody listens; once. The error is that of the last path tried.
  [[nodiscard]] std::error_code connect(const std::vector<std::string>& paths);

  // For poll(): readable when answers wait or the daemon is gone.
  int fileDescriptor() const;

  // Sends a request. Waits, at most 10 s, while the daemon reads nothing. std::errc::message_size and
  // std::errc::invalid_argument for what no frame can carry: nothing is then sent.
  [[nodiscard]] std::error_code request(std::string_view method, const Arguments& arguments,
                                        AnswerHandler handler);

  // Waits up to `timeout` for something to arrive, then runs the handlers of all answers that are there.
  // Fails when the connection is gone; std::errc::timed_out when nothing came (with a zero time-out: no
  // error).
  [[nodiscard]] std::error_code processAnswers(std::chrono::milliseconds timeout);

  // Sends a request and waits for its answer; handlers of others that arrive before it run. None on failure
  // or after `timeout`; `error` says which.
  std::optional<Answer> call(std::string_view method, const Arguments& arguments,
                             std::chrono::milliseconds timeout, std::error_code& error);

 private:
  class Inbox;
  class Library;

  std::unique_ptr<Inbox> inbox_;  // outlives the library's client, which puts into it
  std::unique_ptr<Library> library_;
};

}  // namespace tonewerk
