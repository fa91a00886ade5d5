// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <vector>

#include "protocol/AudioEvent.h"
#include "values/Mix.h"

namespace tonewerk {

class TWReportingSession;

// Finds a session by its identifier among the sessions of one user's clients, however many there are.
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

  // find() of this identifier comes soon, after two others that are expected first. Asks the processor for
  // the memory that a message for the session needs, step by step: where the session is, the session, and
  // what it refers to. Does nothing while there are few sessions, whose memory is in the caches.
  void expect(ReporterID reporterID);

  // Null for an unknown identifier.
  Session find(ReporterID reporterID) const;

  // A session and its client's number; the number means nothing without a session.
  struct Found {
    Session session;
    ClientNumber client = 0;
  };
  Found findWithClient(ReporterID reporterID) const;

 private:
  // A session that is found; null in a free place.
  struct Place {
    ReporterID reporterID = 0;
    ClientNumber client = 0;
    Session session;
  };
  static constexpr std::size_t kFewestPlaces = 16;
  static constexpr std::size_t kFewSessions = 64;

  // The place at which a search for the identifier begins. Clients choose the identifiers, and could choose
  // ones that collide under a known hash.
  std::size_t homeOf(ReporterID reporterID) const {
    return mix(static_cast<std::uint64_t>(reporterID) ^ seed_, 0x9E3779B97F4A7C15U) & (places_.size() - 1);
  }
  // The number of the identifier's place, or of the free one where it belongs.
  std::size_t placeOf(ReporterID reporterID) const;
  void resize(std::size_t places);
  void free(std::size_t place);

  // A hash table with linear probing, at most half full, so that a look-up waits for memory once.
  std::vector<Place> places_ = std::vector<Place>(kFewestPlaces);
  std::size_t used_ = 0;
  std::array<ReporterID, 2> expected_{};  // the last ones, the newest first
  const std::uint64_t seed_ = randomKey();
  // The sessions that are not found, because a client that connected earlier has one with that identifier.
  std::map<ReporterID, std::map<ClientNumber, Session>> others_;
};

}  // namespace tonewerk
