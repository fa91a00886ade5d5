// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "platform/Log.h"
#include "protocol/AudioEvent.h"
#include "service/TWReportingServiceProtocol.h"
#include "session/KeptBytesBudget.h"
#include "values/Mutex.h"

namespace tonewerk {

class TWReportingServiceDelegateProtocol;
class TWReportingSession;

// One connected client process and its sessions: what its connection's requests are made to.
//
// Each request is moved onto the work queue, where it runs in the order of arrival; only the kill request
// acts at once, and a client is an onlooker at once. clientStartDate and clientProcessName may be read and
// set on any thread, the session map belongs to the work queue.
class TWReportingClientServerInstance final
    : public TWReportingServiceProtocol,
      public std::enable_shared_from_this<TWReportingClientServerInstance> {
 public:
  // Creating one more is refused, and so is a message that names more: a list of identifiers, however often
  // it names one session, must not turn one frame into a million deliveries.
  static constexpr std::size_t kMaxSessions = 4096;

  using SessionMap = std::map<ReporterID, std::shared_ptr<TWReportingSession>>;

  // `delegate` is held weakly; a request that finds it gone does nothing.
  TWReportingClientServerInstance(std::int32_t processIdentifier,
                                  std::weak_ptr<TWReportingServiceDelegateProtocol> delegate);
  TWReportingClientServerInstance(const TWReportingClientServerInstance&) = delete;
  TWReportingClientServerInstance& operator=(const TWReportingClientServerInstance&) = delete;
  ~TWReportingClientServerInstance() override;

  void createReportingSession(ReporterID reporterID, ServiceRequest request) override;
  void setServiceType(AudioServiceType serviceType, ReporterID reportingSession,
                      ServiceRequest request) override;
  void getServiceNameForReporterID(ReporterID reporterID, ServiceRequest request) override;
  void setConfiguration(ValueMap configuration, ReporterID reporterID, ServiceRequest request) override;
  void startReportingSessionForID(ReporterID reporterID, ServiceRequest request) override;
  void sendMessage(ValueMap message, AudioEventCategory category, AudioEventType type,
                   ReporterIDs reporterIDs, ServiceRequest request) override;
  void stopReportingSessionForID(ReporterID reporterID, ServiceRequest request) override;
  void destroyReportingSession(ReporterID reporterID, ServiceRequest request) override;
  void reporterIDValid(ReporterID reporterID, ServiceRequest request) override;
  void getAllReporters(ServiceRequest request) override;
  void killService() override;
  void observe(ServiceRequest request) override;

  // This client's session of that identifier, else, when asked to, any client's; null when there is none.
  std::shared_ptr<TWReportingSession> findReportingSessionForID(ReporterID reporterID, bool acrossAllClients);

  // The connection is lost: stops the started sessions, drops them all and leaves the service's list. Any
  // thread; only the first call does anything.
  void handleConnectionError();

  std::int32_t processIdentifier() const { return processIdentifier_; }

  // Whether it has said that it only looks on. Any thread.
  bool isOnlooker() const { return isOnlooker_; }

  // Seconds since 1970; none until the service has registered the client.
  std::optional<double> clientStartDate() const;
  void setClientStartDate(double date);
  std::optional<std::string> clientProcessName() const;
  void setClientProcessName(std::optional<std::string> name);

  const SessionMap& clientReportingSessionMap() const;

 private:
  using Delegate = std::shared_ptr<TWReportingServiceDelegateProtocol>;
  using Session = std::shared_ptr<TWReportingSession>;

  // Queues `body`, called with the delegate and the reply, on the work queue.
  template <typename Body>
  void onWorkQueue(ServiceRequest request, Body body);

  // Of log lines on its coming and going: nobody wants to read of who only looks.
  LogLevel presenceLevel() const { return isOnlooker_ ? LogLevel::kDebug : LogLevel::kInfo; }
  Session ownSession(ReporterID reporterID) const;
  Session makeSession(ReporterID reporterID) const;
  void changeServiceType(AudioServiceType serviceType, const Session& session);

  const std::int32_t processIdentifier_;
  const std::weak_ptr<TWReportingServiceDelegateProtocol> delegate_;
  const std::shared_ptr<KeptBytesBudget> budget_;
  SessionMap clientReportingSessionMap_;
  std::atomic<bool> isOnlooker_ = false;

  mutable Mutex mutex_;
  std::optional<double> clientStartDate_ GUARDED_BY(mutex_);
  std::optional<std::string> clientProcessName_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
