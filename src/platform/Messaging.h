// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "platform/RequestHandler.h"

namespace tonewerk {

// A client's connection, as the listener's delegate sets it up.
//
//   accepted -> set up by the delegate -> resumed -> requests ... -> ended
//                                                                    interruption handler
//                                                                    invalidation handler
//                                                                    exported object let go
//
// Everything here runs on the messaging thread. After a connection has ended, replies to it go nowhere.
class MessagingConnection {
 public:
  virtual ~MessagingConnection() = default;

  // The peer's, as the kernel says it.
  virtual std::int32_t processIdentifier() const = 0;
  virtual std::uint32_t userIdentifier() const = 0;  // kNoUser when it says none

  // For log lines.
  virtual std::string description() const = 0;

  // Before resume(). `interface` must outlive the connection; `object` is held until the invalidation handler
  // has returned.
  virtual void exportObject(const RequestSet& interface, std::shared_ptr<RequestHandler> object) = 0;

  // Before resume(). Called when the connection has ended, in one direction or both, first the interruption
  // handler, then the invalidation handler, once each.
  virtual void setInterruptionHandler(std::function<void()> handler) = 0;
  virtual void setInvalidationHandler(std::function<void()> handler) = 0;

  // From now on requests are read.
  virtual void resume() = 0;
};

class MessagingListenerDelegate {
 public:
  virtual ~MessagingListenerDelegate() = default;

  // On the messaging thread, for every new connection, before anything is read from it. False turns it away.
  // The connection belongs to the listener and lives until its invalidation handler has returned.
  [[nodiscard]] virtual bool listenerShouldAcceptNewConnection(MessagingConnection& connection) = 0;
};

// The named service that clients connect to.
class MessagingListener {
 public:
  virtual ~MessagingListener() = default;

  // Before resume(); `delegate` outlives the listener.
  virtual void setDelegate(MessagingListenerDelegate& delegate) = 0;

  // Starts to accept connections.
  virtual void resume() = 0;

  // Accepts nothing more and ends every connection; their handlers have returned when this does. Not from the
  // messaging thread.
  virtual void shutDown() = 0;
};

}  // namespace tonewerk
