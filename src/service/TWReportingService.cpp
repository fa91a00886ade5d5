// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingService.h"

#include <algorithm>
#include <cassert>
#include <chrono>
#include <string>
#include <utility>

#include "monitor/TWReportingSystemMonitor.h"
#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/ProcessInformation.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/TurnQueue.h"
#include "platform/accounts/WorkingFor.h"
#include "protocol/Requests.h"
#include "service/ClientUptime.h"
#include "service/TWReportingClientServerInstance.h"
#include "service/TWReportingServiceExport.h"
#include "service/WatchRequests.h"
#include "session/MessageShapes.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr ReporterID kSingleMessageReporterID = 1;
constexpr std::chrono::milliseconds kReaperInterval{500};

const auto category = &TWReportingServiceDelegateCategory;

// While the journal is played, requests for sessions may be left whose beginning is not in it any more.
LogLevel unknownSessionLevel() {
  return TWReportingContext::current().journal().isPlaying() ? LogLevel::kDebug : LogLevel::kError;
}

double now() { return TWReportingContext::current().platform().clock.now(); }
std::chrono::nanoseconds monotonic() { return TWReportingContext::current().platform().clock.monotonic(); }

}  // namespace

std::shared_ptr<TWReportingService> TWReportingService::make(std::function<void()> endProcess) {
  return std::make_shared<TWReportingService>(std::move(endProcess));
}

TWReportingService::TWReportingService(std::function<void()> endProcess)
    : endProcess_(std::move(endProcess)) {
  TWReportingSystemMonitor::initializeWithQueue(TWReportingUtilityGetReportingServerQueue());
}

TWReportingService::~TWReportingService() { infoLog(TWReportingClientCategory(), "destroying service"); }

bool TWReportingService::listenerShouldAcceptNewConnection(MessagingConnection& connection) {
  const std::int32_t processIdentifier = connection.processIdentifier();
  infoLog(category(), "newConnection: %@", connection);
  std::weak_ptr<TWReportingClientServerInstance> weakClient;
  {
    const MutexLock lock(mutex_);
    auto client = std::make_shared<TWReportingClientServerInstance>(processIdentifier, connection.account(),
                                                                    weak_from_this());
    weakClient = client;
    // Comes before all requests of the client, because it is the same user's work.
    TWReportingContext::current().turns().run(
        client->account(), [this, self = weak_from_this(), weakClient, name = connection.processName()] {
          const auto service = self.lock();
          const auto listed = weakClient.lock();
          if (service != nullptr && listed != nullptr) registerClient(listed, name);
          return TurnQueue::Progress::kDone;
        });
    std::shared_ptr<ShapeTable> shapes = client->shapes();
    connection.setRequestHandler(
        requests::all(),
        std::make_shared<TWReportingServiceExport>(
            std::move(client),
            std::make_unique<WatchRequests>(processIdentifier, connection.account(), weak_from_this()),
            connection.account(), std::move(shapes)));
  }
  connection.setInterruptionHandler([weakClient] {
    const auto client = weakClient.lock();
    const bool isOnlooker = client != nullptr && client->isOnlooker();
    logLine(isOnlooker ? LogLevel::kDebug : LogLevel::kInfo, category(),
            "interruptionHandler: connection exited");
    if (client != nullptr) client->handleConnectionError();
  });
  connection.setInvalidationHandler(
      [this, processIdentifier, weakClient] { reportClientUptime(processIdentifier, weakClient); });
  connection.resume();
  return true;
}

const std::vector<TWReportingService::Client>& TWReportingService::getAllClients() const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  return clients_;
}

MessageTap& TWReportingService::messageTap() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  return messageTap_;
}

void TWReportingService::registerClient(const Client& client, const std::optional<std::string>& name) {
  clients_.push_back(client);
  client->listSessionsIn(directory_.indexOf(client->account()->user()), ++lastClientNumber_);
  client->setClientStartDate(now());
  client->setClientProcessName(
      name ? name
           : TWReportingContext::current().platform().processes.processName(client->processIdentifier()));
}

void TWReportingService::reportClientUptime(
    std::int32_t processIdentifier, const std::weak_ptr<TWReportingClientServerInstance>& weakClient) {
  const auto client = weakClient.lock();
  if (client != nullptr) client->handleConnectionError();
  if (client != nullptr && client->isOnlooker()) {
    debugLog(category(), "onlooker %i has gone", processIdentifier);
    return;
  }
  sendClientUptime(processIdentifier, client == nullptr ? std::nullopt : client->clientStartDate(),
                   client == nullptr ? std::nullopt : client->clientProcessName());
}

TWReportingService::Session TWReportingService::findReportingSessionForID(ReporterID reporterID,
                                                                          const Account& requester) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const MutexLock lock(mutex_);
  if (reporterID == 0 || !reportingEnabled_) return nullptr;
  Session session = directory_.find(reporterID, requester);
  if (session == nullptr) {
    logLine(unknownSessionLevel(), category(), "failed to find reporting session %lli", reporterID);
    return nullptr;
  }
  infoLog(category(), "found reporting session %lli for client %i", reporterID,
          session->processIdentifiers().front());
  return session;
}

std::vector<TWReportingService::Session> TWReportingService::getAllActiveReportingSessions(
    const Account& requester) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  std::vector<Session> active;
  for (const Client& client : clients_) {
    if (!client->isReachedBy(requester)) continue;
    const auto& sessions = client->clientReportingSessionMap();
    debugLog(category(), "sessions for client %i : %@", client->processIdentifier(), [&sessions] {
      std::string list;
      for (const auto& [reporterID, session] : sessions)
        list += (list.empty() ? "" : ", ") + session->description();
      return "(" + list + ")";
    });
    for (const auto& [reporterID, session] : sessions) {
      if (session->started()) active.push_back(session);
    }
  }
  return active;
}

// A list of unknown identifiers is one line in the log, however long it is.
std::vector<TWReportingService::Session> TWReportingService::findSessions(
    const std::vector<ReporterID>& reporterIDs, const Account& requester) {
  std::vector<Session> found;
  if (!reportingEnabled_) return found;
  const MutexLock lock(mutex_);
  std::optional<ReporterID> firstUnknown;
  std::size_t others = 0;
  for (const ReporterID reporterID : reporterIDs) {
    if (reporterID == 0) continue;
    if (Session session = directory_.find(reporterID, requester)) {
      infoLog(category(), "found reporting session %lli for client %i", reporterID,
              session->processIdentifiers().front());
      found.push_back(std::move(session));
    } else if (firstUnknown) {
      ++others;
    } else {
      firstUnknown = reporterID;
    }
  }
  if (firstUnknown && others > 0) {
    logLine(unknownSessionLevel(), category(), "failed to find reporting session %lli and %zu others",
            *firstUnknown, others);
  } else if (firstUnknown) {
    logLine(unknownSessionLevel(), category(), "failed to find reporting session %lli", *firstUnknown);
  }
  return found;
}

std::vector<TWReportingService::Session> TWReportingService::findReportingSessionsForIDs(
    const std::optional<std::vector<ReporterID>>& reporterIDs, const std::shared_ptr<Account>& requester) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (reporterIDs && !reporterIDs->empty()) return findSessions(*reporterIDs, *requester);
  std::vector<Session> active = getAllActiveReportingSessions(*requester);
  logReportingSessions();
  if (!active.empty()) return active;
  return {singleMessageSession(requester)};
}

TWReportingService::Session TWReportingService::singleMessageSession(const std::shared_ptr<Account>& user) {
  const MutexLock lock(singleMessageMutex_);
  SingleMessage& single = singleMessages_[user->user()];
  if (single.session == nullptr) {
    infoLog(category(), "Creating singleMessageSession");
    single.account = user;
    single.firstRecord = JournalPosition::current().sequence();
    TWReportingContext::current().journal().openedSingleMessages(user->user(), single.firstRecord);
    single.session = makeSingleMessageSession(user);
  }
  // While the journal is played, its records say when the session ends.
  if (singleMessageSessionReaper_ == nullptr && !TWReportingContext::current().journal().isPlaying()) {
    singleMessageSessionReaper_ =
        TWReportingContext::current().platform().timers.repeat(kReaperInterval, [self = weak_from_this()] {
          if (const auto service = self.lock()) service->_reapSingleMessageSession();
        });
  }
  single.lastRetrieved = monotonic();
  return single.session;
}

std::vector<TWReportingService::Session> TWReportingService::currentSingleMessageSessions() const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const MutexLock lock(singleMessageMutex_);
  std::vector<Session> sessions;
  for (const auto& [user, single] : singleMessages_) sessions.push_back(single.session);
  return sessions;
}

TWReportingService::Session TWReportingService::makeSingleMessageSession(
    const std::shared_ptr<Account>& user) {
  const std::int32_t ownIdentifier =
      TWReportingContext::current().platform().processes.ownProcessIdentifier();
  Session session = TWReportingSession::initWithID(kSingleMessageReporterID, {ownIdentifier},
                                                   std::make_shared<KeptBytesBudget>(user));
  session->setSingleMessageSession(true);
  session->setServiceType(kServiceStandalone);
  const ValueMap configuration{{TWReportingApplicationName, "Unknown"}};
  // Whether it fits changes nothing for the client's message.
  (void)session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  return session;
}

void TWReportingService::_reapSingleMessageSession() {
  const MutexLock lock(singleMessageMutex_);
  for (auto at = singleMessages_.begin(); at != singleMessages_.end();) {
    const double elapsed = std::chrono::duration<double>(monotonic() - at->second.lastRetrieved).count();
    if (!(kSingleMessageSessionTimeoutSeconds < elapsed)) {
      debugLog(category(), "Not stopping singleMessageSession. elapsed=%f timeout=%f", elapsed,
               kSingleMessageSessionTimeoutSeconds);
      ++at;
      continue;
    }
    infoLog(category(), "Stopping singleMessageSession after timeout=%f",
            kSingleMessageSessionTimeoutSeconds);
    // Queued under the lock, so that a thread that finds no session knows that its stop is already queued.
    const std::shared_ptr<Account> account = at->second.account;
    TWReportingContext::current().turns().add(account, [single = std::move(at->second)] {
      stopSingleMessageSession(single);
      return TurnQueue::Progress::kDone;
    });
    at = singleMessages_.erase(at);
  }
  if (singleMessages_.empty()) singleMessageSessionReaper_.reset();
}

void TWReportingService::stopSingleMessageSession(const SingleMessage& single) {
  RequestJournal& journal = TWReportingContext::current().journal();
  const std::uint32_t user = single.account->user();
  JournalPosition position = journal.position(journal.keepEndOfSingleMessages(user));
  const JournalPosition::Scope scope(position);
  single.session->stop();
  journal.closedSingleMessages(user, single.firstRecord);
}

void TWReportingService::stopSingleMessageSession(std::uint32_t user) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  SingleMessage taken;
  {
    const MutexLock lock(singleMessageMutex_);
    const auto found = singleMessages_.find(user);
    if (found == singleMessages_.end()) return;
    taken = std::move(found->second);
    singleMessages_.erase(found);
  }
  const WorkingFor scope(taken.account);
  stopSingleMessageSession(taken);
}

void TWReportingService::stopSingleMessageSessions() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  std::map<std::uint32_t, SingleMessage> taken;
  {
    const MutexLock lock(singleMessageMutex_);
    singleMessageSessionReaper_.reset();
    taken = std::exchange(singleMessages_, {});
  }
  for (const auto& [user, single] : taken) {
    const WorkingFor scope(single.account);
    stopSingleMessageSession(single);
  }
}

void TWReportingService::removeClient(const TWReportingClientServerInstance& client) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  std::erase_if(clients_, [&client](const Client& listed) { return listed.get() == &client; });
}

void TWReportingService::logReportingSessions() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const LogCategory* log = category();
  if (!log->isEnabled(LogLevel::kDebug)) return;  // the list is needed for the log only
  const std::vector<Session> active =
      getAllActiveReportingSessions(*TWReportingContext::current().platform().accounts.own());
  debugLog(log, "%ld active reporting session(s) %@", active.size(), active);
}

}  // namespace tonewerk
