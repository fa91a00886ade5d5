// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/RequestHandler.h"

namespace tonewerk {

class Account;

// A client's connection, from the view of the listener's delegate.
//
//   accepted -> set up by the delegate -> resumed -> requests ... -> ended
//                                                                    interruption handler
//                                                                    invalidation handler
//                                                                    request handler released
//
// Everything here runs on the messaging thread. Replies to a connection that has ended are dropped.
class MessagingConnection {
 public:
  virtual ~MessagingConnection() = default;

  // Identify the peer, as the kernel reports it.
  virtual std::int32_t processIdentifier() const = 0;
  virtual std::uint32_t userIdentifier() const = 0;  // kNoUser when the kernel reports none
  // The account of the peer's user. It outlives the connection.
  virtual const std::shared_ptr<Account>& account() const = 0;

  // The process's name, when the transport knows it: of a client that is gone, and whose requests are played
  // again.
  virtual std::optional<std::string> processName() const { return std::nullopt; }

  // For log lines.
  virtual std::string description() const = 0;

  // Sets who handles the requests. Call before resume(). `requests` must outlive the connection; `handler` is
  // kept until the invalidation handler has returned.
  virtual void setRequestHandler(const RequestSet& requests, std::shared_ptr<RequestHandler> handler) = 0;

  // Set the handlers that run when the connection has ended, in one direction or both: first the interruption
  // handler, then the invalidation handler, once each. Call before resume().
  virtual void setInterruptionHandler(std::function<void()> handler) = 0;
  virtual void setInvalidationHandler(std::function<void()> handler) = 0;

  // Starts to read requests.
  virtual void resume() = 0;
};

class MessagingListenerDelegate {
 public:
  virtual ~MessagingListenerDelegate() = default;

  // Runs on the messaging thread for every new connection, before anything is read from it. Returns false to
  // refuse the connection. The connection belongs to the listener and lives until its invalidation handler
  // has returned.
  [[nodiscard]] virtual bool listenerShouldAcceptNewConnection(MessagingConnection& connection) = 0;
};

// The named service to which clients connect.
class MessagingListener {
 public:
  virtual ~MessagingListener() = default;

  // Call before resume(). `delegate` outlives the listener.
  virtual void setDelegate(MessagingListenerDelegate& delegate) = 0;

  // Starts accepting connections.
  virtual void resume() = 0;

  // Stops accepting connections and ends every connection. All their handlers have returned when this
  // returns. Do not call it on the messaging thread.
  virtual void shutDown() = 0;
};

}  // namespace tonewerk
