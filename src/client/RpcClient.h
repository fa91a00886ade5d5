// SPDX-License-Identifier: Apache-2.0
#pragma once

// Header only. For our own programs that use values, whichever way their requests reach the daemon.
#include <chrono>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <string_view>
#include <system_error>
#include <utility>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// The answer to a request: an error, or a result (none for nil).
struct Answer {
  std::optional<ReplyError> error;
  std::optional<Value> result;
};

using AnswerHandler = std::function<void(const Answer& answer)>;

// Sends requests over one connection to the daemon. For one thread.
//
// Requests are answered in the order in which they complete; a start's answer only comes with the session's
// stop, so answers go to handlers. Handlers run inside processAnswers() and call(), never inside request().
// Handlers that still wait when the connection ends are dropped.
class RpcClient {
 public:
  RpcClient() = default;
  RpcClient(const RpcClient&) = delete;
  RpcClient& operator=(const RpcClient&) = delete;
  virtual ~RpcClient() = default;

  // For poll(): readable when there are answers or the connection has ended. -1 when not connected.
  virtual int fileDescriptor() const = 0;

  // Sends a request. Waits at most 10 s while the daemon does not read. std::errc::message_size and
  // std::errc::invalid_argument when no frame can contain the arguments; nothing is then sent.
  [[nodiscard]] virtual std::error_code request(std::string_view method, const Arguments& arguments,
                                                AnswerHandler handler) = 0;

  // Waits up to `timeout` for answers, then runs the handlers of all that have arrived. Fails when the
  // connection has ended. std::errc::timed_out when no answer has arrived; with a time-out of zero that is no
  // error.
  [[nodiscard]] std::error_code processAnswers(std::chrono::milliseconds timeout) {
    using std::chrono::milliseconds;
    const std::error_code error = receive(arrived_.empty() ? timeout : milliseconds::zero());
    const bool hasAnswers = !arrived_.empty();
    while (!arrived_.empty()) {
      const Arrival arrival = std::move(arrived_.front());
      arrived_.pop_front();
      if (arrival.handler) arrival.handler(arrival.answer);
    }
    const bool isNothing = error == std::errc::timed_out && timeout <= milliseconds::zero();
    return hasAnswers || isNothing ? std::error_code() : error;
  }

  // Sends a request and waits for its answer. Handlers of other answers that arrive before it run. None on
  // failure or after `timeout`, with the reason in `error`.
  [[nodiscard]] std::optional<Answer> call(std::string_view method, const Arguments& arguments,
                                           std::chrono::milliseconds timeout, std::error_code& error) {
    using std::chrono::milliseconds;
    const auto until = std::chrono::steady_clock::now() + timeout;
    // Shared, because after a time-out the answer may still come.
    const auto answer = std::make_shared<std::optional<Answer>>();
    error = request(method, arguments, [answer](const Answer& given) { *answer = given; });
    while (!error && !answer->has_value()) {
      const auto left = std::chrono::ceil<milliseconds>(until - std::chrono::steady_clock::now());
      error = left > milliseconds::zero() ? processAnswers(left) : std::make_error_code(std::errc::timed_out);
    }
    return *answer;
  }

 protected:
  // An answer and the handler that waits for it.
  struct Arrival {
    AnswerHandler handler;
    Answer answer;
  };

  // Waits up to `timeout` for answers and passes those that have arrived to arrive(). std::errc::timed_out
  // when there were none; std::errc::not_connected, or the error that ended the connection.
  [[nodiscard]] virtual std::error_code receive(std::chrono::milliseconds timeout) = 0;
  void arrive(Arrival arrival) { arrived_.push_back(std::move(arrival)); }
  bool hasArrivals() const { return !arrived_.empty(); }
  // Drops the answers when the connection ends. May be called inside a handler, which is then the last one.
  void dropArrivals() { arrived_.clear(); }

 private:
  std::deque<Arrival> arrived_;
};

}  // namespace tonewerk
