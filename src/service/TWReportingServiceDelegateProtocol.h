// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "protocol/AudioEvent.h"

namespace tonewerk {

class Account;
class MessageTap;
class TWReportingClientServerInstance;
class TWReportingSession;

// What client objects need of the service. Called on the work queue, unless a member says otherwise.
//
// A `requester` reaches the sessions of its user's clients; one that is trusted reaches those of all clients.
class TWReportingServiceDelegateProtocol {
 public:
  using Session = std::shared_ptr<TWReportingSession>;
  using Client = std::shared_ptr<TWReportingClientServerInstance>;

  virtual ~TWReportingServiceDelegateProtocol() = default;

  // Returns the session with that identifier; if several clients have one, that of the client that connected
  // first. Null for 0, for an unknown identifier and while reporting is disabled.
  virtual Session findReportingSessionForID(ReporterID reporterID, const Account& requester) = 0;

  // Returns the sessions that a message goes to: the named ones that exist. Without names these are all
  // started sessions, or the requester's single-message session when none is started.
  virtual std::vector<Session> findReportingSessionsForIDs(
      const std::optional<std::vector<ReporterID>>& reporterIDs,
      const std::shared_ptr<Account>& requester) = 0;

  // The started sessions that the requester reaches.
  virtual std::vector<Session> getAllActiveReportingSessions(const Account& requester) = 0;

  // Each user has a single-message session while it is needed.
  virtual std::vector<Session> currentSingleMessageSessions() const = 0;

  // In order of connection.
  virtual const std::vector<Client>& getAllClients() const = 0;

  // Any thread.
  virtual bool isReportingEnabled() const = 0;

  virtual void removeClient(const TWReportingClientServerInstance& client) = 0;
  virtual void logReportingSessions() = 0;

  // Shows clients' messages to the clients that watch.
  virtual MessageTap& messageTap() = 0;

  // Ends the process with exit status 2 when the sinks have written what they were given. Does not stop
  // sessions. Any thread.
  virtual void endProcess() = 0;
};

}  // namespace tonewerk
