// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusConnection.h"

#include <cerrno>
#include <system_error>
#include <systemd/sd-bus.h>
#include <utility>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/dbus/DbusAnswer.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"

namespace tonewerk {
namespace {

// The bytes that a request holds until it has finished: its message, which the answer needs, and its values.
std::size_t bytesHeldBy(const DbusArguments& read) {
  std::size_t bytes = read.wireBytes + read.arguments.capacity() * sizeof(Argument);
  for (const Argument& argument : read.arguments) {
    if (argument) bytes += argument->bytes();
  }
  return bytes;
}

// A request that is under way: what it holds is charged to its user until its body has run.
class ChargedRequest final : public InFlightCounter {
 public:
  ChargedRequest(InFlightToken token, Charge charge) : token_(std::move(token)), charge_(std::move(charge)) {}

  void finished(std::size_t /*bytes*/) override {
    token_ = {};
    charge_ = {};
  }

 private:
  InFlightToken token_;
  Charge charge_;
};

ReplyError tooMuchUnderWay() {
  return messagingError(kOverLimit, "too many requests of this client's user are under way");
}

}  // namespace

DbusConnection::DbusConnection(const DbusConnectionContext& context, std::uint64_t identifier,
                               std::string name)
    : context_(context),
      identifier_(identifier),
      name_(std::move(name)),
      account_(context.accounts.of(kNoUser)),
      waitingCharge_(account_, Resource::kUnfinishedBytes, 0),
      window_(std::make_shared<RequestWindow>(context.waker, identifier)),
      outbox_(std::make_shared<DbusOutbox>(context.waker, identifier)) {}

DbusConnection::~DbusConnection() {
  outbox_->close();
  if (context_.memory != nullptr) context_.memory->clientEnded();
}

std::string DbusConnection::description() const {
  const std::string user = peer_.userIdentifier == kNoUser ? "unknown" : std::to_string(peer_.userIdentifier);
  return "connection " + std::to_string(identifier_) + " of process " +
         std::to_string(peer_.processIdentifier) + ", user " + user + ", on D-Bus as " + name_;
}

void DbusConnection::setRequestHandler(const RequestSet&, std::shared_ptr<RequestHandler> object) {
  object_ = std::move(object);
}

void DbusConnection::resume() {
  isResumed_ = true;
  dispatchWaiting();
}

std::optional<ReplyError> DbusConnection::handleCall(sd_bus_message* call,
                                                     const DbusInterface::Entry& entry) {
  const WorkingFor scope(account_);
  if (rejection_) return rejection_;
  if (!account_->hasRoom(Resource::kUnfinishedBytes)) return tooMuchUnderWay();
  if (!window_->hasRoom(outbox_->unsentBytes())) {
    return messagingError(kOverLimit, "too many requests of this client are under way");
  }
  const Method& method = context_.interface.methodOf(entry);
  DbusArguments read = readDbusArguments(call, entry, method, context_.texts);
  if (context_.memory != nullptr) context_.memory->clientSent(read.wireBytes);
  if (read.problem) return std::move(read.problem);
  const std::size_t bytes = bytesHeldBy(read) + method.replyBytes;
  InFlightToken token = window_->start(bytes);
  dispatch(
      {entry.index, std::move(read.arguments), replyTo(call, method.result.type), std::move(token), bytes});
  return std::nullopt;
}

// An empty reply when the caller does not want an answer.
Reply DbusConnection::replyTo(sd_bus_message* call, ResultType result) {
  if (sd_bus_message_get_expect_reply(call) <= 0) return {};
  const std::uint32_t number = nextCall_++;
  calls_.insert_or_assign(number, Call{BusMessage(sd_bus_message_ref(call)), result});
  return {std::make_shared<DbusReply>(outbox_, number), number};
}

void DbusConnection::dispatch(Request request) {
  if (!isAccepted_ || !isResumed_) {
    waitingCharge_.setTo(waitingCharge_.amount() + request.bytes);
    waiting_.push_back(std::move(request));
    return;
  }
  request.token = InFlightToken(
      std::make_shared<ChargedRequest>(std::move(request.token),
                                       Charge(account_, Resource::kUnfinishedBytes, request.bytes)),
      0);
  const Method& method = context_.interface.methodAt(request.method);
  if (const auto problem = problemWithCaller(method, account_->isTrusted())) return request.reply(problem);
  // Kept alive here, because the request may end the connection.
  const std::shared_ptr<RequestHandler> object = object_;
  object->handleRequest(request.method, std::move(request.arguments), std::move(request.reply),
                        std::move(request.token));
}

void DbusConnection::dispatchWaiting() {
  if (!isAccepted_ || !isResumed_) return;
  waitingCharge_.reduceTo(0);
  for (Request& request : std::exchange(waiting_, {})) dispatch(std::move(request));
}

void DbusConnection::identify(DbusPeer peer) {
  if (std::exchange(isIdentified_, true)) return;
  peer_ = peer;
  account_ = context_.accounts.of(peer.userIdentifier);
  const WorkingFor scope(account_);
  infoLog(context_.log, "new %@", *this);
  if (account_->user() != peer.userIdentifier) {
    return reject(messagingError(kOverLimit, "the service has too many users"));
  }
  hasPlace_ = account_->take(Resource::kBusConnections, 1);
  if (!hasPlace_) return reject(messagingError(kOverLimit, "the user has too many clients"));
  isAccepted_ = context_.delegate.listenerShouldAcceptNewConnection(*this) && object_ != nullptr;
  if (isAccepted_) return dispatchWaiting();
  reject(messagingError(kNotPermitted, "the service does not take this client"));
}

void DbusConnection::reject(ReplyError error) {
  infoLog(context_.log, "%@ was turned away", *this);
  waitingCharge_.reduceTo(0);
  for (Request& request : std::exchange(waiting_, {})) request.reply(error);
  rejection_ = std::move(error);
}

bool DbusConnection::sendNext(sd_bus* bus) {
  const std::optional<DbusOutcome> outcome = outbox_->next();
  if (!outcome) return false;
  const auto found = calls_.find(outcome->call);
  if (found == calls_.end()) return true;
  const Call call = std::move(found->second);
  calls_.erase(found);
  if (!outcome->isAnswered) return true;
  const BusMessage answer = makeDbusAnswer(call.message.get(), call.result, outcome->error, outcome->result);
  const int result = answer == nullptr ? -ENOMEM : sd_bus_send(bus, answer.get(), nullptr);
  // When the bus is gone, the next sd_bus_process() reports it.
  if (result < 0 && result != -ENOTCONN) {
    errorLog(context_.log, "cannot answer %@: %@", *this, std::generic_category().message(-result));
  }
  return true;
}

void DbusConnection::end() {
  if (std::exchange(hasEnded_, true)) return;
  const WorkingFor scope(account_);
  waitingCharge_.reduceTo(0);
  outbox_->close();
  calls_.clear();
  waiting_.clear();
  if (isIdentified_) infoLog(context_.log, "%@ has ended", *this);
  if (std::exchange(hasPlace_, false)) account_->give(Resource::kBusConnections, 1);
  if (interrupted_) interrupted_();
  if (invalidated_) invalidated_();
  interrupted_ = nullptr;
  invalidated_ = nullptr;
  object_ = nullptr;
}

}  // namespace tonewerk
