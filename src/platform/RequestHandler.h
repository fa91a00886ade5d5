// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// Sends answers to a peer. Any thread.
class ReplySink {
 public:
  virtual ~ReplySink() = default;
  // A `result` of none is nil. With an error there is no result.
  virtual void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
                     const std::optional<Value>& result) = 0;
};

// Answers a request. It can be copied, and called never, once or several times, on any thread, also when the
// peer is gone. An empty Reply, which belongs to a notification, drops the answer.
class Reply {
 public:
  Reply() = default;
  Reply(std::shared_ptr<ReplySink> sink, std::uint32_t requestIdentifier)
      : sink_(std::move(sink)), requestIdentifier_(requestIdentifier) {}

  void operator()(const std::optional<ReplyError>& error,
                  const std::optional<Value>& result = std::nullopt) const {
    if (sink_ != nullptr) sink_->reply(requestIdentifier_, error, result);
  }

 private:
  std::shared_ptr<ReplySink> sink_;
  std::uint32_t requestIdentifier_ = 0;
};

// Counts the requests of one connection that have not finished. Any thread.
class InFlightCounter {
 public:
  virtual ~InFlightCounter() = default;
  virtual void finished(std::size_t bytes) = 0;
};

// Reports by its destruction that a request's body has run. Code that passes the body to a queue passes the
// token with it.
class InFlightToken {
 public:
  InFlightToken() = default;
  InFlightToken(std::shared_ptr<InFlightCounter> counter, std::size_t bytes)
      : counter_(std::move(counter)), bytes_(bytes) {}
  InFlightToken(InFlightToken&&) noexcept = default;
  InFlightToken& operator=(InFlightToken&& other) noexcept {
    finish();
    counter_ = std::move(other.counter_);
    bytes_ = other.bytes_;
    return *this;
  }
  ~InFlightToken() { finish(); }

 private:
  void finish() {
    if (counter_ != nullptr) counter_->finished(bytes_);
    counter_ = nullptr;
  }

  std::shared_ptr<InFlightCounter> counter_;
  std::size_t bytes_ = 0;
};

// Handles the requests of a connection.
class RequestHandler {
 public:
  virtual ~RequestHandler() = default;

  // Runs on the messaging thread, in the order of arrival. It must not block. `method` is the index in the
  // request set; `arguments` fit the method.
  virtual void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) = 0;
};

}  // namespace tonewerk
