// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "protocol/AudioEvent.h"

namespace tonewerk {

class MessageTap;
class TWReportingClientServerInstance;
class TWReportingSession;

// What client objects ask of the service. On the work queue unless said otherwise.
class TWReportingServiceDelegateProtocol {
 public:
  using Session = std::shared_ptr<TWReportingSession>;
  using Client = std::shared_ptr<TWReportingClientServerInstance>;

  virtual ~TWReportingServiceDelegateProtocol() = default;

  // The session of that identifier of the client that connected first; null for 0, for an unknown identifier
  // and while reporting is disabled.
  virtual Session findReportingSessionForID(ReporterID reporterID) = 0;

  // Where a message goes: the sessions named, as far as they exist; without names every started session, or
  // else the single-message session.
  virtual std::vector<Session> findReportingSessionsForIDs(
      const std::optional<std::vector<ReporterID>>& reporterIDs) = 0;

  // The started sessions of all clients.
  virtual std::vector<Session> getAllActiveReportingSessions() = 0;

  // The single-message session while there is one, else null.
  virtual Session currentSingleMessageSession() const = 0;

  // In order of connection.
  virtual const std::vector<Client>& getAllClients() const = 0;

  // Any thread.
  virtual bool isReportingEnabled() const = 0;

  virtual void removeClient(const TWReportingClientServerInstance& client) = 0;
  virtual void logReportingSessions() = 0;

  // Whoever watches the messages that clients send.
  virtual MessageTap& messageTap() = 0;

  // Ends the process with the exit status 2 once what the sinks were handed is written; stops no session. Any
  // thread.
  virtual void endProcess() = 0;
};

}  // namespace tonewerk
