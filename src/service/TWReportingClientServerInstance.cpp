// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingClientServerInstance.h"

#include <algorithm>
#include <cassert>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/SerialQueue.h"
#include "platform/accounts/TurnQueue.h"
#include "protocol/Requests.h"
#include "service/MessageTap.h"
#include "service/TWReportingServiceDelegateProtocol.h"
#include "session/MessageShapes.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingTracePoint.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr std::string_view kReportingErrorDomain = "com.orvane.audio.reporting";
constexpr std::int64_t kReportingDisabled = 1;
constexpr std::string_view kSendSingleMessage = "sendSingleMessage";

const auto category = &TWReportingServiceDelegateCategory;

ReplyError overBudget(const KeptBytesBudget& budget) {
  const Account* user = budget.account();
  if (user != nullptr && !user->hasRoomFor(Resource::kKeptBytes, KeptBytesBudget::kLotBytes)) {
    return messagingError(
        kOverLimit, "the user's sessions keep " + std::to_string(user->held(Resource::kKeptBytes)) +
                        " bytes, the user's share is " + std::to_string(user->share(Resource::kKeptBytes)));
  }
  return messagingError(kOverLimit, "the connection's sessions keep " + std::to_string(budget.used()) +
                                        " bytes, the most is " + std::to_string(budget.limit()));
}

}  // namespace

TWReportingClientServerInstance::TWReportingClientServerInstance(
    std::int32_t processIdentifier, std::shared_ptr<Account> account,
    std::weak_ptr<TWReportingServiceDelegateProtocol> delegate)
    : processIdentifier_(processIdentifier),
      account_(std::move(account)),
      delegate_(std::move(delegate)),
      budget_(std::make_shared<KeptBytesBudget>(account_)),
      shapes_(makeMessageShapes()),
      journalClient_{.process = processIdentifier, .user = account_->user()} {
  infoLog(category(), "new client with pid %lu", processIdentifier);
}

TWReportingClientServerInstance::~TWReportingClientServerInstance() {
  logLine(connectionLogLevel(), category(), "dealloc %i from the server client list", processIdentifier_);
}

bool TWReportingClientServerInstance::isReachedBy(const Account& requester) const {
  return requester.user() == account_->user() || requester.isTrusted();
}

template <typename Body>
void TWReportingClientServerInstance::onWorkQueue(ServiceRequest request, Body body) {
  if (TWReportingUtilityGetReportingServerQueue().isCurrent()) {
    if (const Delegate delegate = delegate_.lock()) body(*this, delegate, request.reply);
    return;
  }
  TWReportingContext::current().turns().add(
      account_, [self = shared_from_this(), request = std::move(request), body = std::move(body)]() mutable {
        if (const Delegate delegate = self->delegate_.lock()) body(*self, delegate, request.reply);
        return TurnQueue::Progress::kDone;
      });
}

void TWReportingClientServerInstance::createReportingSession(ReporterID reporterID, ServiceRequest request) {
  onWorkQueue(std::move(request), [reporterID](auto& self, const Delegate&, const Reply& reply) {
    const TracedRequest traced(TWReportingTracePoint::kRequestCreate, reporterID);
    debugLog(category(), "creating session for reporter %lli", reporterID);
    const SessionMap& sessions = self.clientReportingSessionMap_;
    if (sessions.size() >= kMaxSessions && !sessions.contains(reporterID)) {
      return reply(messagingError(kOverLimit, "the connection holds " + std::to_string(sessions.size()) +
                                                  " sessions, the most there may be"));
    }
    const Session session = self.makeSession(reporterID);
    if (!session->takeOwnBytes()) return reply(overBudget(*self.budget_));
    session->setClientProcessName(self.clientProcessName());
    // An earlier session with this identifier is dropped without a stop, because its client has given it up.
    if (const auto earlier = sessions.find(reporterID); earlier != sessions.end()) {
      earlier->second->endLife(SessionEnding::kReplaced);
    }
    self.setSession(reporterID, session);
    TWReportingContext::current().journal().opened(self.journalClient_, reporterID,
                                                   self.lastConnectionRecord_);
    infoLog(category(), "session created for reporter %lli", reporterID);
    reply(std::nullopt, true);
  });
}

void TWReportingClientServerInstance::setServiceType(AudioServiceType serviceType,
                                                     ReporterID reportingSession, ServiceRequest request) {
  onWorkQueue(
      std::move(request), [serviceType, reportingSession](auto& self, const Delegate&, const Reply& reply) {
        debugLog(category(), "setting service type %i for reporter %lli", serviceType, reportingSession);
        if (const Session session = self.ownSession(reportingSession)) {
          self.changeServiceType(serviceType, session);
          debugLog(category(), "service type %i set for reporter  %lli", serviceType, reportingSession);
        }
        reply(std::nullopt, true);
      });
}

// A session reports for one service. A change of the type therefore makes a new session, not started, with
// the configuration and the previous values of the old one.
void TWReportingClientServerInstance::changeServiceType(AudioServiceType serviceType,
                                                        const Session& session) {
  if (session->serviceType() == serviceType) return session->setServiceType(serviceType);
  const ValueMap configuration = session->configuration();
  // Come first, so that the budget has room for the new session's copies, however full it is.
  const KeptBytesBudget::Hold hold(*budget_);
  session->leaveBudget();
  const Session replacement = makeSession(session->reporterID());
  // They fit, because the old session has left the budget.
  (void)replacement->takeOwnBytes();
  (void)replacement->updateConfigurationWithContentsOfConfiguration(&configuration);
  replacement->takePreviousValuesOf(*session);
  session->endLife(SessionEnding::kReplaced);
  replacement->setServiceType(serviceType);
  setSession(session->reporterID(), replacement);
}

void TWReportingClientServerInstance::getServiceNameForReporterID(ReporterID reporterID,
                                                                  ServiceRequest request) {
  onWorkQueue(std::move(request), [reporterID](auto& self, const Delegate&, const Reply& reply) {
    debugLog(category(), "fetching seviceType");
    // Identifier 0 is answered twice, because clients rely on the first answer.
    if (reporterID == 0) reply(std::nullopt, kServiceUnknown);
    const Session session = self.findReportingSessionForID(reporterID, true);
    const AudioServiceType serviceType = session == nullptr ? kServiceUnknown : session->serviceType();
    debugLog(category(), "returning service type %i for reporter  %lli", serviceType, reporterID);
    reply(std::nullopt, serviceType);
  });
}

void TWReportingClientServerInstance::setConfiguration(ValueMap configuration, ReporterID reporterID,
                                                       ServiceRequest request) {
  onWorkQueue(std::move(request), [configuration = std::move(configuration), reporterID](
                                      auto& self, const Delegate&, const Reply& reply) {
    debugLog(category(), "setting configuration");
    const Session session = self.ownSession(reporterID);
    if (session != nullptr && !session->updateConfigurationWithContentsOfConfiguration(&configuration)) {
      return reply(overBudget(*self.budget_));
    }
    reply(std::nullopt, true);
  });
}

void TWReportingClientServerInstance::startReportingSessionForID(ReporterID reporterID,
                                                                 ServiceRequest request) {
  onWorkQueue(std::move(request), [reporterID](auto& self, const Delegate& delegate, const Reply& reply) {
    const TracedRequest traced(TWReportingTracePoint::kRequestStart, reporterID);
    debugLog(category(), "starting session for reporter %lli", reporterID);
    const Session session = self.ownSession(reporterID);
    if (session == nullptr) return reply(std::nullopt, true);
    if (session->started()) return;  // not answered on purpose: the first start's answer counts for both
    session->start();
    if (session->transactionCompleteBlock) session->transactionCompleteBlock(std::nullopt, true);
    session->transactionCompleteBlock = [reply](const std::optional<ReplyError>& error, bool success) {
      reply(error, success);
    };
    if (session->serviceType() == kServiceTest && TWReportingUtilityIsInternalBuild())
      reply(std::nullopt, true);
    delegate->logReportingSessions();
  });
}

void TWReportingClientServerInstance::sendMessage(ValueMap message, AudioEventCategory messageCategory,
                                                  AudioEventType type, const ReporterIDs& reporterIDs,
                                                  ServiceRequest request) {
  if (reporterIDs && reporterIDs->size() > kMaxSessions) {
    return request.reply(
        messagingError(kOverLimit, "the message names " + std::to_string(reporterIDs->size()) +
                                       " sessions, the most is " + std::to_string(kMaxSessions)));
  }
  if (!reporterIDs || reporterIDs->empty()) {
    const Delegate delegate = delegate_.lock();
    if (delegate != nullptr && delegate->isReportingEnabled() && TWReportingUtilityIsInternalBuild()) {
      message.set(kSendSingleMessage, true);
    }
  }
  if (TWReportingUtilityGetReportingServerQueue().isCurrent()) {
    const Delegate delegate = delegate_.lock();
    if (delegate == nullptr) return;
    return deliver(delegate, std::move(message), messageCategory, type, reporterIDs, request);
  }
  TWReportingContext::current().turns().add(
      account_, [self = shared_from_this(), message = std::move(message), messageCategory, type, reporterIDs,
                 received = std::move(request)]() mutable {
        const Delegate delegate = self->delegate_.lock();
        if (delegate != nullptr) {
          self->deliver(delegate, std::move(message), messageCategory, type, reporterIDs, received);
        }
        return TurnQueue::Progress::kDone;
      });
}

struct TWReportingClientServerInstance::Delivery {
  ValueMap message;
  AudioEventCategory messageCategory;
  AudioEventType type;
  std::vector<Session> sessions;
  std::shared_ptr<TWReportingServiceDelegateProtocol> delegate;
  std::shared_ptr<KeptBytesBudget> sender;
  ServiceRequest request;
  std::size_t bytes;  // of the message
  Charge charge;      // for the sessions that are still to get it
  JournalPosition position = JournalPosition::current();
  std::size_t next = 0;

  void send(const Session& session, ValueMap payload) const {
    TWReportingSessionMessage record(std::move(payload), messageCategory, type);
    session->sendMessage(record, nullptr, sender);
    delegate->messageTap().note(*session, record);
  }

  // Sends to the next sessions until the user's turn is over.
  TurnQueue::Progress run(const TurnQueue& turns) {
    const JournalPosition::Scope scope(position);
    while (next < sessions.size()) {
      if (turns.mustGiveUp()) {
        errorLog(category(),
                 "a message does not reach the last %zu of its %zu sessions, because the daemon ends",
                 sessions.size() - next, sessions.size());
        break;
      }
      const Session session = std::move(sessions[next++]);
      // The last session gets the only reference and can change the message without a copy.
      send(session, next == sessions.size() ? std::move(message) : message);
      if (next == sessions.size() || !turns.isTurnOverAfterLongStep()) continue;
      charge.reduceTo(bytes * (sessions.size() - next));
      return TurnQueue::Progress::kMore;
    }
    request.reply(std::nullopt);
    return TurnQueue::Progress::kDone;
  }
};

void TWReportingClientServerInstance::deliver(const Delegate& delegate, ValueMap message,
                                              AudioEventCategory messageCategory, AudioEventType type,
                                              const ReporterIDs& reporterIDs, ServiceRequest& request) {
  const TracedRequest traced(TWReportingTracePoint::kRequestSend);
  debugLog(category(), "sending message for reporter %@", reporterIDs);
  if (!delegate->isReportingEnabled()) {
    return request.reply(ReplyError{std::string(kReportingErrorDomain), kReportingDisabled, ""});
  }
  if (reporterIDs && reporterIDs->size() == 1) {  // nearly always; without a list of sessions
    const ReporterID only = reporterIDs->front();
    const Session session = only == 0 ? nullptr : delegate->findReportingSessionForID(only, *account_);
    if (session != nullptr) {
      TWReportingSessionMessage record(std::move(message), messageCategory, type);
      session->sendMessage(record, nullptr, budget_);
      delegate->messageTap().note(*session, record);
    }
    return request.reply(std::nullopt);
  }
  const auto delivery =
      std::make_shared<Delivery>(Delivery{std::move(message),
                                          messageCategory,
                                          type,
                                          delegate->findReportingSessionsForIDs(reporterIDs, account_),
                                          delegate,
                                          budget_,
                                          std::move(request),
                                          0,
                                          {}});
  if (delivery->sessions.size() > 1) {
    delivery->bytes = delivery->message.bytes();
    // At most the user's share: that is enough to keep its other requests waiting, and leaves others theirs.
    const std::uint64_t bytes = std::min<std::uint64_t>(delivery->bytes * delivery->sessions.size(),
                                                        account_->share(Resource::kUnfinishedBytes));
    delivery->charge = Charge(account_, Resource::kUnfinishedBytes, bytes);
  }
  TurnQueue& turns = TWReportingContext::current().turns();
  while (delivery->run(turns) == TurnQueue::Progress::kMore) {
    TurnQueue::Piece rest = [delivery, &turns] { return delivery->run(turns); };
    if (turns.continueFirst(rest)) return;
  }
}

void TWReportingClientServerInstance::stopReportingSessionForID(ReporterID reporterID,
                                                                ServiceRequest request) {
  onWorkQueue(std::move(request), [reporterID](auto& self, const Delegate& delegate, const Reply& reply) {
    const TracedRequest traced(TWReportingTracePoint::kRequestStop, reporterID);
    debugLog(category(), "stopping session for reporter %lli", reporterID);
    if (reporterID == 0) return reply(std::nullopt, true);
    const Session session = self.ownSession(reporterID);
    if (session != nullptr && session->started()) {
      session->stop();
      if (session->transactionCompleteBlock) session->transactionCompleteBlock(std::nullopt, true);
      session->transactionCompleteBlock = nullptr;
      delegate->logReportingSessions();
    } else {
      if (session != nullptr) session->logUnkeptMessages();
      debugLog(category(),
               "Stop called, but session==nil or session.started==false. reporterID=%lli session=%@ "
               "session.started=%i",
               reporterID, session, session != nullptr && session->started());
    }
    debugLog(category(), "stopping %lli", reporterID);
    reply(std::nullopt, true);
  });
}

void TWReportingClientServerInstance::destroyReportingSession(ReporterID reporterID, ServiceRequest request) {
  onWorkQueue(std::move(request), [reporterID](auto& self, const Delegate& delegate, const Reply& reply) {
    const TracedRequest traced(TWReportingTracePoint::kRequestDestroy, reporterID);
    debugLog(category(), "destroying session for reporter %lli", reporterID);
    if (reporterID == 0) return reply(std::nullopt, true);
    if (const Session session = self.ownSession(reporterID)) {
      if (session->started()) session->stop();
      session->endLife(SessionEnding::kStopped);
      self.removeSession(reporterID);
    }
    debugLog(category(), "destroying %lli", reporterID);
    delegate->logReportingSessions();
    reply(std::nullopt, true);
  });
}

void TWReportingClientServerInstance::reporterIDValid(ReporterID reporterID, ServiceRequest request) {
  onWorkQueue(std::move(request), [reporterID](auto& self, const Delegate&, const Reply& reply) {
    debugLog(category(), "validating reporter %lli", reporterID);
    ValueMap validity{{TWReporterProxyKeyReporterID, 0}, {TWReporterProxyKeyServiceType, kServiceUnknown}};
    if (const Session session = self.findReportingSessionForID(reporterID, true)) {
      validity.set(TWReporterProxyKeyReporterID, reporterID);
      validity.set(TWReporterProxyKeyServiceType, session->serviceType());
    }
    defaultLog(category(), "validating reporter %lli", reporterID);
    reply(std::nullopt, validity);
  });
}

void TWReportingClientServerInstance::getAllReporters(ServiceRequest request) {
  onWorkQueue(std::move(request), [](auto& self, const Delegate& delegate, const Reply& reply) {
    std::vector<Value> reporters;
    for (const auto& client : delegate->getAllClients()) {
      if (!client->isReachedBy(*self.account_)) continue;
      for (const auto& entry : client->clientReportingSessionMap_) reporters.emplace_back(entry.first);
    }
    reply(std::nullopt, ValueArray(std::move(reporters)));
  });
}

void TWReportingClientServerInstance::expectMessage(ReporterID reporterID) {
  if (index_ != nullptr) index_->expect(reporterID);
}

bool TWReportingClientServerInstance::isKept(const Method& method) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  RequestJournal& journal = TWReportingContext::current().journal();
  if (!journal.isOn()) return false;
  if (method.carriesMessage) {
    const Delegate delegate = delegate_.lock();
    if (delegate == nullptr || !delegate->isReportingEnabled()) return false;
  }
  const bool beginsSession = method.name == requests::kCreateReportingSession.name;
  if (journalClient_.number == 0 || beginsSession ||
      lastConnectionRecord_ < journal.connectionsNeededFrom()) {
    lastConnectionRecord_ = journal.keepConnection(journalClient_, clientProcessName());
  }
  return true;
}

JournalPosition TWReportingClientServerInstance::keepFrame(const Method& method, std::string_view frame) {
  if (!isKept(method)) return JournalPosition();
  RequestJournal& journal = TWReportingContext::current().journal();
  return journal.position(journal.keep(journalClient_, frame));
}

JournalPosition TWReportingClientServerInstance::keepValues(const Method& method,
                                                            const Arguments& arguments) {
  if (!isKept(method)) return JournalPosition();
  RequestJournal& journal = TWReportingContext::current().journal();
  return journal.position(journal.keep(journalClient_, method.name, arguments));
}

void TWReportingClientServerInstance::killService() {
  defaultLog(category(), "DESTROYING SERVICE");
  if (const Delegate delegate = delegate_.lock()) delegate->endProcess();
}

void TWReportingClientServerInstance::observe(ServiceRequest request) {
  isOnlooker_ = true;
  onWorkQueue(std::move(request), [](auto& self, const Delegate&, const Reply& reply) {
    debugLog(category(), "client %i looks on", self.processIdentifier_);
    reply(std::nullopt, true);
  });
}

TWReportingClientServerInstance::Session TWReportingClientServerInstance::findReportingSessionForID(
    ReporterID reporterID, bool acrossAllClients) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (Session own = ownSession(reporterID)) return own;
  const Delegate delegate = acrossAllClients ? delegate_.lock() : nullptr;
  return delegate == nullptr ? nullptr : delegate->findReportingSessionForID(reporterID, *account_);
}

// Identifier 0 means "no session", although the map may have a session under it.
TWReportingClientServerInstance::Session TWReportingClientServerInstance::ownSession(
    ReporterID reporterID) const {
  const auto own = clientReportingSessionMap_.find(reporterID);
  return reporterID == 0 || own == clientReportingSessionMap_.end() ? nullptr : own->second;
}

TWReportingClientServerInstance::Session TWReportingClientServerInstance::makeSession(
    ReporterID reporterID) const {
  Session session = TWReportingSession::initWithID(reporterID, {processIdentifier_}, budget_, shapes_);
  session->setOwnerProcessName(SharedString(clientProcessName().value_or("")));
  return session;
}

// One session after the other, because a stop may take long and other users wait.
void TWReportingClientServerInstance::handleConnectionError() {
  TurnQueue& turns = TWReportingContext::current().turns();
  auto end = [self = shared_from_this(), &turns, last = std::optional<ReporterID>(),
              position = std::optional<JournalPosition>()]() mutable {
    using Progress = TurnQueue::Progress;
    const Delegate delegate = self->delegate_.lock();
    if (delegate == nullptr) return Progress::kDone;
    const auto& clients = delegate->getAllClients();
    if (std::find(clients.begin(), clients.end(), self) == clients.end()) return Progress::kDone;
    if (!position) {
      RequestJournal& journal = TWReportingContext::current().journal();
      position = journal.position(journal.keepEnd(self->journalClient_));
    }
    const JournalPosition::Scope scope(*position);
    SessionMap& sessions = self->clientReportingSessionMap_;
    for (auto at = last ? sessions.upper_bound(*last) : sessions.begin(); at != sessions.end(); ++at) {
      last = at->first;
      if (at->second->started()) at->second->stop(SessionEnding::kDisconnected);
      at->second->endLife(SessionEnding::kDisconnected);
      if (turns.isTurnOverAfterLongStep()) return Progress::kMore;
    }
    while (!sessions.empty()) {
      self->removeSession(sessions.begin()->first);
      if (turns.isTurnOverAfterLongStep()) return Progress::kMore;
    }
    delegate->removeClient(*self);
    logLine(self->connectionLogLevel(), category(), "removing %i from the server client list",
            self->processIdentifier_);
    return Progress::kDone;
  };
  turns.run(account_, std::move(end));
}

void TWReportingClientServerInstance::listSessionsIn(std::shared_ptr<SessionIndex> index,
                                                     SessionIndex::ClientNumber number) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  assert(clientReportingSessionMap_.empty());
  index_ = std::move(index);
  number_ = number;
}

void TWReportingClientServerInstance::setSession(ReporterID reporterID, Session session) {
  if (index_ != nullptr) index_->set(reporterID, number_, session);
  clientReportingSessionMap_[reporterID] = std::move(session);
}

void TWReportingClientServerInstance::removeSession(ReporterID reporterID) {
  if (index_ != nullptr) index_->remove(reporterID, number_);
  TWReportingContext::current().journal().closed(journalClient_, reporterID);
  clientReportingSessionMap_.erase(reporterID);
}

const TWReportingClientServerInstance::SessionMap&
TWReportingClientServerInstance::clientReportingSessionMap() const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  return clientReportingSessionMap_;
}

std::optional<double> TWReportingClientServerInstance::clientStartDate() const {
  const MutexLock lock(mutex_);
  return clientStartDate_;
}

void TWReportingClientServerInstance::setClientStartDate(double date) {
  const MutexLock lock(mutex_);
  clientStartDate_ = date;
}

std::optional<std::string> TWReportingClientServerInstance::clientProcessName() const {
  const MutexLock lock(mutex_);
  return clientProcessName_;
}

void TWReportingClientServerInstance::setClientProcessName(std::optional<std::string> name) {
  const MutexLock lock(mutex_);
  clientProcessName_ = std::move(name);
}

}  // namespace tonewerk
