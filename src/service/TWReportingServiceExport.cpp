// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingServiceExport.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <iterator>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/MemoryReserve.h"
#include "platform/Platform.h"
#include "platform/accounts/Account.h"
#include "platform/accounts/WorkingFor.h"
#include "protocol/Requests.h"
#include "service/WatchRequests.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

ReporterID reporterIDOf(const Argument& argument) { return argument->integer(); }
AudioServiceType serviceTypeOf(const Argument& argument) {
  return static_cast<AudioServiceType>(argument->integer());
}

TWReportingServiceProtocol::ReporterIDs reporterIDsOf(const Argument& argument) {
  if (!argument) return std::nullopt;
  const ValueArray& list = *argument->asArray();
  std::vector<ReporterID> identifiers;
  identifiers.reserve(list.size());
  for (const Value& identifier : list) identifiers.push_back(identifier.integer());
  return identifiers;
}

// The objects that carry out a connection's requests.
struct Targets {
  TWReportingServiceProtocol& service;
  WatchRequests& watch;
};

void sendMessage(const Targets& to, IncomingRequest& in) {
  ValueMap message = *in.arguments[0]->asMap();
  const auto category = static_cast<AudioEventCategory>(in.arguments[1]->integer());
  const auto type = static_cast<AudioEventType>(in.arguments[2]->integer());
  const auto identifiers = reporterIDsOf(in.arguments[3]);
  // Cleared first, so that nothing shares the message's storage and the session can change it without a copy.
  in.arguments.clear();
  to.service.sendMessage(std::move(message), category, type, identifiers, in.request());
}

struct Handler {
  std::string_view name;
  void (*run)(const Targets& to, IncomingRequest& in);
};

constexpr Handler kHandlers[] = {
    {requests::kCreateReportingSession.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.createReportingSession(reporterIDOf(in.arguments[0]), in.request());
     }},
    {requests::kSetServiceType.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.setServiceType(serviceTypeOf(in.arguments[0]), reporterIDOf(in.arguments[1]), in.request());
     }},
    {requests::kGetServiceNameForReporterID.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.getServiceNameForReporterID(reporterIDOf(in.arguments[0]), in.request());
     }},
    {requests::kSetConfiguration.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.setConfiguration(*in.arguments[0]->asMap(), reporterIDOf(in.arguments[1]), in.request());
     }},
    {requests::kStartReportingSessionForID.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.startReportingSessionForID(reporterIDOf(in.arguments[0]), in.request());
     }},
    {requests::kSendMessage.name, sendMessage},
    {requests::kStopReportingSessionForID.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.stopReportingSessionForID(reporterIDOf(in.arguments[0]), in.request());
     }},
    {requests::kDestroyReportingSession.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.destroyReportingSession(reporterIDOf(in.arguments[0]), in.request());
     }},
    {requests::kReporterIDValid.name,
     [](const Targets& to, IncomingRequest& in) {
       to.service.reporterIDValid(reporterIDOf(in.arguments[0]), in.request());
     }},
    {requests::kGetAllReporters.name,
     [](const Targets& to, IncomingRequest& in) { to.service.getAllReporters(in.request()); }},
    {requests::kKillService.name, [](const Targets& to, IncomingRequest&) { to.service.killService(); }},
    {requests::kObserve.name,
     [](const Targets& to, IncomingRequest& in) { to.service.observe(in.request()); }},
    {requests::kWatchSessions.name,
     [](const Targets& to, IncomingRequest& in) {
       to.watch.sessions(in.arguments, std::move(in.reply), std::move(in.token));
     }},
    {requests::kWatchOpenMessages.name,
     [](const Targets& to, IncomingRequest& in) {
       to.watch.openMessages(in.arguments, std::move(in.reply), std::move(in.token));
     }},
    {requests::kWatchNextMessages.name,
     [](const Targets& to, IncomingRequest& in) {
       to.watch.nextMessages(std::move(in.reply), std::move(in.token));
     }},
    {requests::kWatchAccounts.name,
     [](const Targets& to, IncomingRequest& in) { to.watch.accounts(in.reply); }},
};

constexpr std::size_t kNoHandler = std::size(kHandlers);

// The log lines that the requests of one connection may cause at once, and then each second.
constexpr LineAllowance::Rate kConnectionLines{.burst = 2000, .perSecond = 20};

// Returns the index of a request's handler in kHandlers; kNoHandler when it has none.
constexpr std::size_t handlerOf(const Method& method) {
  for (std::size_t at = 0; at < std::size(kHandlers); ++at) {
    if (kHandlers[at].name == method.name) return at;
  }
  return kNoHandler;
}

// The indexes of the handlers, in the order of requests::kAll.
constexpr auto kHandlerOf = [] {
  std::array<std::size_t, requests::kAll.size()> places{};
  for (std::size_t at = 0; at < places.size(); ++at) places[at] = handlerOf(requests::kAll[at]);
  return places;
}();
static_assert(std::find(kHandlerOf.begin(), kHandlerOf.end(), kNoHandler) == kHandlerOf.end(),
              "a request has no handler");
static_assert(std::none_of(requests::kAll.begin(), requests::kAll.end(),
                           [](const Method& method) { return method.carriesMessage && method.forTrusted; }),
              "the way of messages does not ask who the caller is");
static_assert(std::size(kHandlers) == requests::kAll.size(), "a handler has no request");

// Other requests end something, or only look.
bool holdsMemory(const Method& method) {
  return method.carriesMessage || method.name == requests::kCreateReportingSession.name ||
         method.name == requests::kSetConfiguration.name ||
         method.name == requests::kStartReportingSessionForID.name ||
         method.name == requests::kWatchOpenMessages.name;
}

}  // namespace

TWReportingServiceExport::TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                                                   std::unique_ptr<WatchRequests> watch,
                                                   std::shared_ptr<Account> account,
                                                   std::shared_ptr<ShapeTable> shapes)
    : object_(std::move(object)),
      watch_(std::move(watch)),
      account_(std::move(account)),
      lines_(std::make_shared<LineAllowance>(TWReportingContext::current().platform().clock, kConnectionLines,
                                             &account_->lines())),
      shapes_(std::move(shapes)),
      turns_(TWReportingContext::current().turns()) {}

TWReportingServiceExport::~TWReportingServiceExport() = default;

std::optional<ReplyError> TWReportingServiceExport::takeRole(const Method& method) {
  if (method.name == requests::kObserve.name) {
    if (role_ == Role::kClient)
      return messagingError(kNotPermitted, "not permitted: observe comes before what changes something");
    role_ = Role::kOnlooker;
  } else if (method.changesState) {
    if (role_ == Role::kOnlooker) {
      return messagingError(kNotPermitted, "not permitted: the connection only looks on since observe, and " +
                                               std::string(method.name) + " changes something");
    }
    role_ = Role::kClient;
  }
  return std::nullopt;
}

void TWReportingServiceExport::handleReceived(std::unique_ptr<ReceivedRequests> requests) {
  bool areAllDelivered = false;
  const auto deliverQuick = [&] {
    const WorkingFor scope(account_, lines_.get());
    areAllDelivered = requests->deliverQuick();
  };
  if (turns_.runAtOnce(account_, deliverQuick) && areAllDelivered) return;
  Charge charge(account_, Resource::kUnfinishedBytes, requests->bytes());
  turns_.add(account_, [received = std::move(requests), charge = std::move(charge), account = account_,
                        lines = lines_] {
    const WorkingFor scope(account, lines.get());
    return received->deliver() ? TurnQueue::Progress::kDone : TurnQueue::Progress::kMore;
  });
}

bool TWReportingServiceExport::isQuick(std::size_t method, const IncomingMessage* message) const {
  const Method& called = requests::kAll[method];
  if (message == nullptr) return !called.carriesMessage && !called.changesState && !called.forTrusted;
  if (!message->reporterIDs || message->reporterIDs->size() != 1) return false;  // there may be many sessions
  return !TWReportingContext::current().workerRegistry().slowTypes().contains(message->type);
}

bool TWReportingServiceExport::isUrgent(std::size_t method) {
  const std::string_view name = requests::kAll[method].name;
  if (name == requests::kObserve.name) hasAskedToObserve_ = true;
  return name == requests::kKillService.name && account_->isTrusted() &&
         (!hasAskedToObserve_ || role_ == Role::kClient);
}

std::optional<ReplyError> TWReportingServiceExport::refuseWithoutMemory(const Method& method) {
  if (!MemoryReserve::isShort() || !holdsMemory(method) || MemoryReserve::tryToRecover()) return std::nullopt;
  account_->countRefusal(Resource::kUnfinishedBytes);
  errorLog(TWReportingServiceDelegateCategory(), "memory is short: %s is refused", method.name);
  return messagingError(kOverLimit, "the daemon has no memory for it");
}

void TWReportingServiceExport::handleMessage(std::size_t method, IncomingMessage& message, Reply reply,
                                             InFlightToken token) {
  const std::string_view frame = std::exchange(frame_, {});
  const Method& called = requests::kAll[method];
  if (const std::optional<ReplyError> error = takeRole(called)) return reply(error);
  if (const std::optional<ReplyError> error = refuseWithoutMemory(called)) return reply(error);
  JournalPosition position =
      frame.empty() ? object_->keepValues(called, message.arguments()) : object_->keepFrame(called, frame);
  const JournalPosition::Scope scope(position);
  object_->sendMessage(std::move(message.payload), message.category, message.type, message.reporterIDs,
                       {std::move(reply), std::move(token)});
}

void TWReportingServiceExport::handleRequest(std::size_t method, Arguments arguments, Reply reply,
                                             InFlightToken token) {
  const WorkingFor scope(account_, lines_.get());
  const bool isOnQueue = TWReportingUtilityGetReportingServerQueue().isCurrent();
  const std::string_view frame = isOnQueue ? std::exchange(frame_, {}) : std::string_view();
  const Method& called = requests::kAll[method];
  if (const std::optional<ReplyError> error = takeRole(called)) return reply(error);
  if (const std::optional<ReplyError> error = refuseWithoutMemory(called)) return reply(error);
  IncomingRequest incoming{std::move(arguments), std::move(reply), std::move(token)};
  if (!isKept(called)) return kHandlers[kHandlerOf[method]].run({*object_, *watch_}, incoming);
  if (isOnQueue) return keepAndRun(method, frame, incoming);
  turns_.add(account_, [self = shared_from_this(), method, incoming = std::move(incoming)]() mutable {
    const WorkingFor forUser(self->account_, self->lines_.get());
    self->keepAndRun(method, {}, incoming);
    return TurnQueue::Progress::kDone;
  });
}

bool TWReportingServiceExport::isKept(const Method& method) {
  return method.changesState && method.name != requests::kKillService.name;
}

void TWReportingServiceExport::keepAndRun(std::size_t method, std::string_view frame,
                                          IncomingRequest& incoming) {
  const Method& called = requests::kAll[method];
  JournalPosition position =
      frame.empty() ? object_->keepValues(called, incoming.arguments) : object_->keepFrame(called, frame);
  const JournalPosition::Scope scope(position);
  kHandlers[kHandlerOf[method]].run({*object_, *watch_}, incoming);
}

}  // namespace tonewerk
