// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "protocol/AudioEvent.h"
#include "service/SessionIndex.h"
#include "service/TWReportingServiceProtocol.h"
#include "session/KeptBytesBudget.h"
#include "session/RequestJournal.h"
#include "values/Mutex.h"

namespace tonewerk {

class Account;
class TWReportingServiceDelegateProtocol;
class MessageShapes;
class TWReportingSession;

// Represents a connected client process and its sessions, and carries out its requests.
//
// Each request is moved onto the work queue, where requests run in the order of arrival. Only the kill
// request and the mark as onlooker take effect at once. clientStartDate and clientProcessName may be read
// and set on any thread. The session map is used on the work queue.
class TWReportingClientServerInstance final
    : public TWReportingServiceProtocol,
      public std::enable_shared_from_this<TWReportingClientServerInstance> {
 public:
  // The most sessions that a client may hold, and that a message may name. A list of identifiers may name a
  // session many times; without a limit one frame could cause a million deliveries.
  static constexpr std::size_t kMaxSessions = 4096;

  using SessionMap = std::map<ReporterID, std::shared_ptr<TWReportingSession>>;

  // `account` is that of the client's user. The object holds `delegate` weakly. A request does nothing when
  // the delegate is gone.
  TWReportingClientServerInstance(std::int32_t processIdentifier, std::shared_ptr<Account> account,
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
                   const ReporterIDs& reporterIDs, ServiceRequest request) override;
  void stopReportingSessionForID(ReporterID reporterID, ServiceRequest request) override;
  void destroyReportingSession(ReporterID reporterID, ServiceRequest request) override;
  void reporterIDValid(ReporterID reporterID, ServiceRequest request) override;
  void getAllReporters(ServiceRequest request) override;
  void expectMessage(ReporterID reporterID) override;
  JournalPosition keepFrame(const Method& method, std::string_view frame) override;
  JournalPosition keepValues(const Method& method, const Arguments& arguments) override;
  void killService() override;
  void observe(ServiceRequest request) override;

  // Returns this client's session with that identifier. If it has none and `acrossAllClients` is true,
  // returns another client's. Null when there is none.
  std::shared_ptr<TWReportingSession> findReportingSessionForID(ReporterID reporterID, bool acrossAllClients);

  // Call it when the connection is lost. Queues the end of the client: its started sessions stop, all are
  // dropped, and the client leaves the service's list. Any thread; only the first call does anything.
  void handleConnectionError();

  std::int32_t processIdentifier() const { return processIdentifier_; }
  const std::shared_ptr<Account>& account() const { return account_; }
  // Whether a request of this user reaches the client's sessions. Any thread.
  bool isReachedBy(const Account& requester) const;

  // Whether the client has said that it is an onlooker, which changes nothing. Any thread.
  bool isOnlooker() const { return isOnlooker_; }

  // In seconds since 1970; none until the service has registered the client.
  std::optional<double> clientStartDate() const;
  void setClientStartDate(double date);
  std::optional<std::string> clientProcessName() const;
  void setClientProcessName(std::optional<std::string> name);

  const SessionMap& clientReportingSessionMap() const;

  // The shapes of this client's messages. The table is used on the work queue.
  const std::shared_ptr<MessageShapes>& shapes() const { return shapes_; }

  // From now on keeps the client's sessions in `index`, under `number`. Call it once, before any request.
  void listSessionsIn(std::shared_ptr<SessionIndex> index, SessionIndex::ClientNumber number);

 private:
  using Delegate = std::shared_ptr<TWReportingServiceDelegateProtocol>;
  using Session = std::shared_ptr<TWReportingSession>;

  // A message on its way to several sessions.
  struct Delivery;

  // Sends the message to the sessions, and replies. On the work queue. When there are many sessions it goes
  // on in later turns of the user, before the user's other requests.
  void deliver(const Delegate& delegate, ValueMap message, AudioEventCategory messageCategory,
               AudioEventType type, const ReporterIDs& reporterIDs, ServiceRequest& request);

  // Runs `body` with this object, the delegate and the reply: at once on the work queue, else in a turn of
  // the user.
  template <typename Body>
  void onWorkQueue(ServiceRequest request, Body body);

  // Whether requests of the method are kept in the journal. If so, the client is known there.
  [[nodiscard]] bool isKept(const Method& method);

  // The level of the log lines about the client's connection. An onlooker's are for debugging only.
  LogLevel connectionLogLevel() const { return isOnlooker_ ? LogLevel::kDebug : LogLevel::kInfo; }
  Session ownSession(ReporterID reporterID) const;
  Session makeSession(ReporterID reporterID) const;
  void changeServiceType(AudioServiceType serviceType, const Session& session);
  // Sets and removes a session in the client's map and in the index of all clients' sessions.
  void setSession(ReporterID reporterID, Session session);
  void removeSession(ReporterID reporterID);

  const std::int32_t processIdentifier_;
  const std::shared_ptr<Account> account_;
  const std::weak_ptr<TWReportingServiceDelegateProtocol> delegate_;
  const std::shared_ptr<KeptBytesBudget> budget_;
  const std::shared_ptr<MessageShapes> shapes_;
  SessionMap clientReportingSessionMap_;
  std::shared_ptr<SessionIndex> index_;  // null until the service has registered the client
  SessionIndex::ClientNumber number_ = 0;
  std::atomic<bool> isOnlooker_ = false;
  RequestJournal::Client journalClient_;    // used on the work queue
  std::uint64_t lastConnectionRecord_ = 0;  // in the journal; used on the work queue

  mutable Mutex mutex_;
  std::optional<double> clientStartDate_ GUARDED_BY(mutex_);
  std::optional<std::string> clientProcessName_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
