// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

// Takes answers. Any thread.
class ReplySink {
 public:
  virtual ~ReplySink() = default;
  // `result` none is nil. With an error there is no result.
  virtual void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
                     const std::optional<Value>& result) = 0;
};

// The way back to whoever sent a request. Copyable; may be called never, once or several times, on any
// thread, also when the peer is gone. An empty one swallows its answer: a notification's.
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

// Counts the requests of one connection that are not finished. Any thread.
class InFlightCounter {
 public:
  virtual ~InFlightCounter() = default;
  virtual void finished(std::size_t bytes) = 0;
};

// Says, by its destruction, that a request's body has run. Whoever carries the body to a queue carries this
// with it.
class InFlightToken {
 public:
  InFlightToken() = default;
  InFlightToken(std::shared_ptr<InFlightCounter> gauge, std::size_t bytes)
      : gauge_(std::move(gauge)), bytes_(bytes) {}
  InFlightToken(InFlightToken&&) noexcept = default;
  InFlightToken& operator=(InFlightToken&& other) noexcept {
    finish();
    gauge_ = std::move(other.gauge_);
    bytes_ = other.bytes_;
    return *this;
  }
  ~InFlightToken() { finish(); }

 private:
  void finish() {
    if (gauge_ != nullptr) gauge_->finished(bytes_);
    gauge_ = nullptr;
  }

  std::shared_ptr<InFlightCounter> gauge_;
  std::size_t bytes_ = 0;
};

// What a connection's requests are made to.
class RequestHandler {
 public:
  virtual ~RequestHandler() = default;

  // On the messaging thread, in the order of arrival; must not block. `arguments` suit the method.
  virtual void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) = 0;
};

}  // namespace tonewerk
