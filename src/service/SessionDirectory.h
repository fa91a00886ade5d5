// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "protocol/AudioEvent.h"
#include "service/SessionIndex.h"

namespace tonewerk {

class Account;

// Finds a session by its identifier among the sessions that a user may reach: those of the user's own
// clients, and for a trusted user those of all clients. Each user's identifiers are its own.
//
// Used on the work queue.
class SessionDirectory {
 public:
  // The index of one user's sessions. It stays for later clients of the user.
  const std::shared_ptr<SessionIndex>& indexOf(std::uint32_t user);

  // Of several sessions one of the requester's own user, so that nobody can take a trusted user's messages;
  // else, or among these, the one of the client that connected first. Null for an unknown identifier.
  SessionIndex::Session find(ReporterID reporterID, const Account& requester) const;
  // Among the sessions of all users.
  SessionIndex::Session findAmongAll(ReporterID reporterID) const;

 private:
  // In the order in which the users came. There are few of them.
  std::vector<std::pair<std::uint32_t, std::shared_ptr<SessionIndex>>> users_;
};

}  // namespace tonewerk
