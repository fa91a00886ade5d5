// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <utility>

#include "protocol/IncomingMessage.h"
#include "protocol/RequestSet.h"
#include "values/Value.h"

namespace tonewerk {

class ShapeTable;

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

// Requests of one connection that arrived together and are not decoded yet.
class ReceivedRequests {
 public:
  virtual ~ReceivedRequests() = default;

  // Decodes the requests in the order of their arrival and gives them to the connection's handler, whose
  // handleRequest() and handleMessage() run on this thread. Requests that do not fit their method are
  // answered here. Stops when the handler's turn is over. True when all requests are delivered; else it is to
  // be called again. Any thread. Those of one connection, and of all connections of one listener, are
  // delivered one after the other.
  [[nodiscard]] virtual bool deliver() = 0;

  // What the requests that are not delivered hold, about.
  virtual std::size_t bytes() const { return 0; }

  // Does the same up to the first request of which the handler does not say that it is quick.
  [[nodiscard]] virtual bool deliverQuick() { return false; }
};

// Handles the requests of a connection.
class RequestHandler {
 public:
  virtual ~RequestHandler() = default;

  // Handles one request. `method` is the index in the request set; `arguments` fit the method. Runs on the
  // messaging thread and must not block, unless handleReceived() delivers on another thread.
  virtual void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) = 0;

  // Handles one request whose method carries a message, on the thread of handleRequest(). Does what that does
  // with the same arguments. `message` is valid during the call; its payload may be moved away.
  virtual void handleMessage(std::size_t method, IncomingMessage& message, Reply reply, InFlightToken token) {
    handleRequest(method, message.arguments(), std::move(reply), std::move(token));
  }

  // The next call of handleRequest() or handleMessage() is for this frame, the bytes as they came. They are
  // valid until that call returns. On the work queue. Neither a transport without frames calls it, nor is it
  // called for urgent requests.
  virtual void beginFrame(std::string_view /*frame*/) {}

  // Runs on the messaging thread: delivers the requests that are handled soon, or sees that another thread
  // delivers them, in the order of these calls. A transport that decodes on its own thread calls
  // handleRequest() instead.
  virtual void handleReceived(std::unique_ptr<ReceivedRequests> requests) {
    while (!requests->deliver()) {
    }
  }

  // True when others have waited long enough for the requests that are being delivered, so that their
  // delivery is to stop. On the thread that delivers.
  virtual bool isTurnOver() const { return false; }

  // True when a request of this method is handled soon and without waiting. `message` is what it carries;
  // null for a method that carries none, and for a message that cannot be packed. Asked before other
  // arguments are decoded, on the thread of handleRequest().
  virtual bool isQuick(std::size_t /*method*/, const IncomingMessage* /*message*/) const { return false; }

  // A message for this session will be delivered soon, after kExpectedAhead others. Changes nothing: what it
  // needs may be brought from memory meanwhile. On the thread of handleRequest().
  static constexpr std::size_t kExpectedAhead = 3;
  virtual void expectMessage(ReporterID /*session*/) {}

  // The table for the shapes of maps among the arguments; null when they are to be trees. Asked for and used
  // on the thread that delivers.
  virtual ShapeTable* shapes() { return nullptr; }

  // Runs on the messaging thread for each request in the order of arrival, before it is checked. True when it
  // must not wait for what handleReceived() has passed on: it is then delivered at once on the messaging
  // thread.
  virtual bool isUrgent(std::size_t /*method*/) { return false; }
};

}  // namespace tonewerk
