// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <vector>

#include "platform/Messaging.h"
#include "platform/TimerService.h"
#include "service/MessageTap.h"
#include "service/SessionDirectory.h"
#include "service/TWReportingServiceDelegateProtocol.h"
#include "values/Mutex.h"

namespace tonewerk {

// Accepts clients, keeps their list and finds sessions across clients. The daemon has one service. It owns
// the single-message sessions: that of a user takes the user's messages without reporter identifiers while
// none of the user's sessions is started.
//
// Three kinds of thread call it: the messaging threads (acceptance and the connections' handlers), the work
// queue (everything about clients and sessions) and the timers' thread (the reaper).
class TWReportingService final : public MessagingListenerDelegate,
                                 public TWReportingServiceDelegateProtocol,
                                 public std::enable_shared_from_this<TWReportingService> {
 public:
  static constexpr double kSingleMessageSessionTimeoutSeconds = 5.0;

  // `endProcess` is called for the kill request, on the messaging thread that received it. It need not
  // return.
  static std::shared_ptr<TWReportingService> make(std::function<void()> endProcess);
  explicit TWReportingService(std::function<void()> endProcess);
  TWReportingService(const TWReportingService&) = delete;
  TWReportingService& operator=(const TWReportingService&) = delete;
  ~TWReportingService() override;

  // Accepts every connection, whichever process the peer is.
  [[nodiscard]] bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override;

  Session findReportingSessionForID(ReporterID reporterID, const Account& requester) override;
  std::vector<Session> findReportingSessionsForIDs(const std::optional<std::vector<ReporterID>>& reporterIDs,
                                                   const std::shared_ptr<Account>& requester) override;
  std::vector<Session> getAllActiveReportingSessions(const Account& requester) override;
  std::vector<Session> currentSingleMessageSessions() const override;
  const std::vector<Client>& getAllClients() const override;
  bool isReportingEnabled() const override { return reportingEnabled_; }
  void removeClient(const TWReportingClientServerInstance& client) override;
  void logReportingSessions() override;
  MessageTap& messageTap() override;
  void endProcess() override { endProcess_(); }

  // The reaper calls this twice a second on the timers' thread. A single-message session that was last used
  // more than kSingleMessageSessionTimeoutSeconds ago is taken out, and its stop is queued on the work queue.
  void _reapSingleMessageSession();

  // Stops the single-message sessions. Called at the daemon's end, on the work queue.
  void stopSingleMessageSessions();

  // Stops that of one user, if there is one. On the work queue.
  void stopSingleMessageSession(std::uint32_t user);

  void setReportingEnabled(bool enabled) { reportingEnabled_ = enabled; }

 private:
  // `name` of the process; none to ask the system.
  void registerClient(const Client& client, const std::optional<std::string>& name);
  void reportClientUptime(std::int32_t processIdentifier,
                          const std::weak_ptr<TWReportingClientServerInstance>& client);
  std::vector<Session> findSessions(const std::vector<ReporterID>& reporterIDs, const Account& requester);
  Session singleMessageSession(const std::shared_ptr<Account>& user);
  static Session makeSingleMessageSession(const std::shared_ptr<Account>& user);

  const std::function<void()> endProcess_;
  std::atomic<bool> reportingEnabled_ = true;
  std::vector<Client> clients_;                      // in order of connection; used on the work queue
  SessionIndex::ClientNumber lastClientNumber_ = 0;  // used on the work queue
  SessionDirectory directory_;                       // of all clients' sessions; used on the work queue
  MessageTap messageTap_;                            // used on the work queue

  Mutex mutex_;  // held while a client is made and while a session is searched for; guards no member

  struct SingleMessage {
    std::shared_ptr<Account> account;
    Session session;
    std::chrono::nanoseconds lastRetrieved{0};  // in monotonic time, because the wall clock can jump
    std::uint64_t firstRecord = 0;              // in the journal; 0 when there is none
  };
  // On the work queue.
  static void stopSingleMessageSession(const SingleMessage& single);

  mutable Mutex singleMessageMutex_;
  // By user. A user has none while its messages go to other sessions.
  std::map<std::uint32_t, SingleMessage> singleMessages_ GUARDED_BY(singleMessageMutex_);
  std::unique_ptr<Timer> singleMessageSessionReaper_ GUARDED_BY(singleMessageMutex_);
};

}  // namespace tonewerk
