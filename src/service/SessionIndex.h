// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <unordered_map>

#include "protocol/AudioEvent.h"
#include "values/Mix.h"

namespace tonewerk {

class TWReportingSession;

// Finds a session by its identifier among the sessions of all clients, however many there are.
//
// Several clients may use the same identifier. Then the session of the client that connected first is found.
// Used on the work queue.
class SessionIndex {
 public:
  using Session = std::shared_ptr<TWReportingSession>;
  // Clients are numbered in order of connection.
  using ClientNumber = std::uint64_t;

  // Adds a session, or replaces the one that the client has under that identifier.
  void set(ReporterID reporterID, ClientNumber client, Session session);
  void remove(ReporterID reporterID, ClientNumber client);

  // Null for an unknown identifier.
  Session find(ReporterID reporterID) const;

 private:
  // The sessions with one identifier. There is mostly only one.
  struct Holders {
    ClientNumber firstClient;
    Session first;
    std::map<ClientNumber, Session> others;  // of clients that connected later
  };
  // Clients choose the identifiers, and could choose ones that collide under a known hash.
  struct SeededHash {
    SeededHash() : seed(randomKey()) {}
    std::size_t operator()(ReporterID reporterID) const {
      return mix(static_cast<std::uint64_t>(reporterID) ^ seed, 0x9E3779B97F4A7C15U);
    }
    std::uint64_t seed;
  };

  std::unordered_map<ReporterID, Holders, SeededHash> sessions_;
};

}  // namespace tonewerk
