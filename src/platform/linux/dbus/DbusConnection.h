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
#include "platform/accounts/Account.h"
#include "platform/linux/dbus/DbusArguments.h"
#include "platform/linux/dbus/DbusInterface.h"
#include "platform/linux/dbus/DbusOutbox.h"
#include "platform/linux/dbus/SdBus.h"
#include "platform/linux/messaging/RequestWindow.h"
#include "platform/linux/threads/IoWaker.h"

namespace tonewerk {

class Accounts;
class AllocatorReclaimer;

// Shared by all clients on one bus.
struct DbusConnectionContext {
  const DbusInterface& interface;
  MessagingListenerDelegate& delegate;
  Accounts& accounts;
  std::shared_ptr<IoWaker> waker;
  RpcStrings& texts;
  const LogCategory& log;
  // Learns how many bytes a client has sent, and when it is gone. May be null.
  AllocatorReclaimer* memory;
};

// The process behind a name on the bus, as the bus reports it.
struct DbusPeer {
  std::int32_t processIdentifier = 0;  // 0 when the bus does not know it, because the peer is gone
  std::uint32_t userIdentifier = kNoUser;
};

// Serves one client on the bus, on the bus's thread. A client is a unique name that has made a request.
//
//   handleCall() ... handleCall()   requests wait
//   identify()                      asks the delegate; the requests then go to the request handler
//   handleCall() ...                requests go to the object at once
//   end()                           the name has vanished, or the bus is gone
//
// All clients share the bus, so the connection cannot stop reading for one of them as it can on a socket. It
// refuses requests beyond the bounds of RequestWindow.
class DbusConnection final : public MessagingConnection {
 public:
  // `context` outlives the connection. `identifier` is its number in the waker.
  DbusConnection(const DbusConnectionContext& context, std::uint64_t identifier, std::string name);
  DbusConnection(const DbusConnection&) = delete;
  DbusConnection& operator=(const DbusConnection&) = delete;
  ~DbusConnection() override;

  std::int32_t processIdentifier() const override { return peer_.processIdentifier; }
  std::uint32_t userIdentifier() const override { return peer_.userIdentifier; }
  // That of the unknown user until identify().
  const std::shared_ptr<Account>& account() const override { return account_; }
  std::string description() const override;
  void setRequestHandler(const RequestSet& interface, std::shared_ptr<RequestHandler> object) override;
  void setInterruptionHandler(std::function<void()> handler) override { interrupted_ = std::move(handler); }
  void setInvalidationHandler(std::function<void()> handler) override { invalidated_ = std::move(handler); }
  void resume() override;

  // Handles a call of this client. If it refuses the call, it returns the error.
  [[nodiscard]] std::optional<ReplyError> handleCall(sd_bus_message* call, const DbusInterface::Entry& entry);
  // The bus has said who the client is. Later calls do nothing.
  void identify(DbusPeer peer);
  bool isIdentified() const { return isIdentified_; }
  // The client's user has as many clients as its share allows. Once this one has its answers it is to be
  // removed, so that it takes no other client's place.
  bool hasNoPlace() const { return isIdentified_ && !hasPlace_; }
  // Sends one answer. False when no answer is waiting.
  [[nodiscard]] bool sendNext(sd_bus* bus);
  // Ends the connection. Its handlers have returned when this returns. Later calls do nothing.
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
    std::size_t bytes;  // that it holds
  };

  [[nodiscard]] Reply replyTo(sd_bus_message* call, ResultType result);
  void dispatch(Request request);
  void dispatchWaiting();
  void reject(ReplyError error);

  const DbusConnectionContext& context_;
  const std::uint64_t identifier_;
  const std::string name_;
  DbusPeer peer_;
  std::shared_ptr<Account> account_;
  bool hasPlace_ = false;  // its account has been charged for the connection

  std::shared_ptr<RequestHandler> object_;
  std::function<void()> interrupted_;
  std::function<void()> invalidated_;
  bool isIdentified_ = false;
  std::optional<ReplyError> rejection_;  // set when the client is not served
  bool isAccepted_ = false;
  bool isResumed_ = false;
  bool hasEnded_ = false;

  std::vector<Request> waiting_;  // until the connection is accepted and resumed
  Charge waitingCharge_;          // for waiting_
  std::unordered_map<std::uint32_t, Call> calls_;
  std::uint32_t nextCall_ = 0;
  std::shared_ptr<RequestWindow> window_;
  std::shared_ptr<DbusOutbox> outbox_;
};

}  // namespace tonewerk
