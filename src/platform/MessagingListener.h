// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/MessagingConnection.h"

namespace tonewerk {

class MessagingListenerDelegate {
 public:
  virtual ~MessagingListenerDelegate() = default;

  // On the messaging thread, for every new connection, before anything is read from it. False turns it away.
  // The connection belongs to the listener and lives until its invalidation handler has returned.
  virtual bool listenerShouldAcceptNewConnection(MessagingConnection& connection) = 0;
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
