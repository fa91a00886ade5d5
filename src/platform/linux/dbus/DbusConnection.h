// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "platform/Log.h"
#include "platform/Messaging.h"
#include "platform/linux/dbus/DbusArguments.h"
#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/dbus/DbusOutbox.h"
#include "platform/linux/dbus/SdBus.h"
#include "platform/linux/messaging/RequestWindow.h"
#include "platform/linux/threads/IoWaker.h"

namespace tonewerk {

class AllocatorReclaimer;

// What the clients on one bus share.
struct DbusConnectionContext {
  const DbusInterface& interface;
  MessagingListenerDelegate& delegate;
  std::shared_ptr<IoWaker> waker;
  RpcStrings& texts;
  const LogCategory& log;
  AllocatorReclaimer* memory;  // told of what clients bring, and of their ends; may be null
};

// Who is behind a name on the bus, as the bus says.
struct DbusPeer {
  std::int32_t processIdentifier = 0;  // 0 when the bus does not say: the peer was gone before it was asked
  std::uint32_t userIdentifier = kNoUser;
};

// One client on the bus, on the bus's thread: a unique name that has made a request.
//
//   take() ... take()   requests wait
//   identify()          the delegate is asked, and the requests go to the exported object
//   take() ...          requests go there at once
//   end()               the name has vanished, or the bus has
//
// The bus is shared, so it cannot be left unread for one client alone as a socket can: what goes past the
// bounds of RequestWindow is refused.
class DbusConnection final : public MessagingConnection {
 public:
  // `context` outlives the connection. `identifier` is its number in the waker.
  DbusConnection(const DbusConnectionContext& context, std::uint64_t identifier, std::string name);
  DbusConnection(const DbusConnection&) = delete;
  DbusConnection& operator=(const DbusConnection&) = delete;
  ~DbusConnection() override;

  std::int32_t processIdentifier() const override { return peer_.processIdentifier; }
  std::uint32_t userIdentifier() const override { return peer_.userIdentifier; }
  std::string description() const override;
  void exportObject(const RequestSet& interface, std::shared_ptr<RequestHandler> object) override;
  void setInterruptionHandler(std::function<void()> handler) override { interrupted_ = std::move(handler); }
  void setInvalidationHandler(std::function<void()> handler) override { invalidated_ = std::move(handler); }
  void resume() override;

  // A call has come. What it is refused for, if it is.
  [[nodiscard]] std::optional<ReplyError> take(sd_bus_message* call, const DbusInterface::Entry& entry);
  // The bus has said who the client is. Once.
  void identify(DbusPeer peer);
  bool isIdentified() const { return isIdentified_; }
  // Sends one answer; false when there is none.
  [[nodiscard]] bool sendNext(sd_bus* bus);
  // Ends the connection; its handlers have returned when this does. Once; later calls do nothing.
  void end();

 private:
  // A call that may still be answered.
  struct Call {
    BusMessage message;
    ResultType result;
  };
  struct Request {
    std::size_t method;
    Arguments arguments;
    Reply reply;
    InFlightToken token;
  };

  [[nodiscard]] Reply replyTo(sd_bus_message* call, ResultType result);
  void handOver(Request request);
  void handOverWaiting();

  const DbusConnectionContext& context_;
  const std::uint64_t identifier_;
  const std::string name_;
  DbusPeer peer_;

  std::shared_ptr<RequestHandler> object_;
  std::function<void()> interrupted_;
  std::function<void()> invalidated_;
  bool isIdentified_ = false;
  bool isTurnedAway_ = false;
  bool isAccepted_ = false;
  bool isResumed_ = false;
  bool hasEnded_ = false;

  std::vector<Request> waiting_;  // for the connection to be accepted and resumed
  std::unordered_map<std::uint32_t, Call> calls_;
  std::uint32_t nextCall_ = 0;
  std::shared_ptr<RequestWindow> load_;
  std::shared_ptr<DbusOutbox> outbox_;
};

}  // namespace tonewerk
