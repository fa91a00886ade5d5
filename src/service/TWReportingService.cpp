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
#include "platform/SerialQueue.h"
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

double now() { return TWReportingContext::current().platform().clock.now(); }

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
    auto client = std::make_shared<TWReportingClientServerInstance>(processIdentifier, weak_from_this());
    weakClient = client;
    TWReportingUtilityGetReportingServerQueue().async([this, self = weak_from_this(), weakClient] {
      const auto service = self.lock();
      const auto listed = weakClient.lock();
      if (service != nullptr && listed != nullptr) registerClient(listed);
    });
    std::shared_ptr<ShapeTable> shapes = client->shapes();
    connection.setRequestHandler(
        requests::all(),
        std::make_shared<TWReportingServiceExport>(
            std::move(client), std::make_unique<WatchRequests>(processIdentifier, weak_from_this()),
            std::move(shapes)));
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

void TWReportingService::registerClient(const Client& client) {
  clients_.push_back(client);
  client->listSessionsIn(sessionIndex_, ++lastClientNumber_);
  client->setClientStartDate(now());
  client->setClientProcessName(
      TWReportingContext::current().platform().processes.processName(client->processIdentifier()));
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

TWReportingService::Session TWReportingService::findReportingSessionForID(ReporterID reporterID) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const MutexLock lock(mutex_);
  if (reporterID == 0 || !reportingEnabled_) return nullptr;
  Session session = sessionIndex_->find(reporterID);
  if (session == nullptr) {
    errorLog(category(), "failed to find reporting session %lli", reporterID);
    return nullptr;
  }
  infoLog(category(), "found reporting session %lli for client %i", reporterID,
          session->processIdentifiers().front());
  return session;
}

std::vector<TWReportingService::Session> TWReportingService::getAllActiveReportingSessions() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  std::vector<Session> active;
  for (const Client& client : clients_) {
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

std::vector<TWReportingService::Session> TWReportingService::findReportingSessionsForIDs(
    const std::optional<std::vector<ReporterID>>& reporterIDs) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (reporterIDs && !reporterIDs->empty()) {
    std::vector<Session> found;
    for (const ReporterID reporterID : *reporterIDs) {
      if (reporterID == 0) continue;
      if (Session session = findReportingSessionForID(reporterID)) found.push_back(std::move(session));
    }
    return found;
  }
  std::vector<Session> active = getAllActiveReportingSessions();
  logReportingSessions();
  if (!active.empty()) return active;
  return {singleMessageSession()};
}

TWReportingService::Session TWReportingService::singleMessageSession() {
  const MutexLock lock(singleMessageMutex_);
  if (singleMessageSession_ == nullptr) {
    infoLog(category(), "Creating singleMessageSession");
    singleMessageSession_ = makeSingleMessageSession();
  }
  if (singleMessageSessionReaper_ == nullptr) {
    singleMessageSessionReaper_ =
        TWReportingContext::current().platform().timers.repeat(kReaperInterval, [self = weak_from_this()] {
          if (const auto service = self.lock()) service->_reapSingleMessageSession();
        });
  }
  singleMessageSessionLastRetrieved_ = now();
  return singleMessageSession_;
}

TWReportingService::Session TWReportingService::currentSingleMessageSession() const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const MutexLock lock(singleMessageMutex_);
  return singleMessageSession_;
}

TWReportingService::Session TWReportingService::makeSingleMessageSession() {
  const std::int32_t ownIdentifier =
      TWReportingContext::current().platform().processes.ownProcessIdentifier();
  Session session = TWReportingSession::initWithID(kSingleMessageReporterID, {ownIdentifier});
  session->setSingleMessageSession(true);
  session->setServiceType(kServiceStandalone);
  const ValueMap configuration{{TWReportingApplicationName, "Unknown"}};
  (void)session->updateConfigurationWithContentsOfConfiguration(&configuration);  // fits: its budget is empty
  session->start();
  return session;
}

void TWReportingService::_reapSingleMessageSession() {
  const MutexLock lock(singleMessageMutex_);
  if (singleMessageSession_ == nullptr || !singleMessageSessionLastRetrieved_) return;
  const double elapsed = now() - *singleMessageSessionLastRetrieved_;
  if (!(kSingleMessageSessionTimeoutSeconds < elapsed)) {
    debugLog(category(), "Not stopping singleMessageSession. elapsed=%f timeout=%f", elapsed,
             kSingleMessageSessionTimeoutSeconds);
    return;
  }
  infoLog(category(), "Stopping singleMessageSession after timeout=%f", kSingleMessageSessionTimeoutSeconds);
  singleMessageSessionReaper_.reset();
  // Queued under the lock, so that a thread that finds no session knows that its stop is already on the
  // queue.
  TWReportingUtilityGetReportingServerQueue().async(
      [session = std::exchange(singleMessageSession_, nullptr)] { session->stop(); });
}

void TWReportingService::stopSingleMessageSession() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  Session session;
  {
    const MutexLock lock(singleMessageMutex_);
    singleMessageSessionReaper_.reset();
    session = std::exchange(singleMessageSession_, nullptr);
  }
  if (session != nullptr) session->stop();
}

void TWReportingService::removeClient(const TWReportingClientServerInstance& client) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  std::erase_if(clients_, [&client](const Client& listed) { return listed.get() == &client; });
}

void TWReportingService::logReportingSessions() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const LogCategory* log = category();
  if (!log->isEnabled(LogLevel::kDebug)) return;  // the list is needed for the log only
  const std::vector<Session> active = getAllActiveReportingSessions();
  debugLog(log, "%ld active reporting session(s) %@", active.size(), active);
}

}  // namespace tonewerk
