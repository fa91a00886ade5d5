// SPDX-License-Identifier: Apache-2.0
#include "service/SessionIndex.h"

#include <cassert>
#include <utility>

#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/Prefetch.h"

namespace tonewerk {

std::size_t SessionIndex::placeOf(ReporterID reporterID) const {
  const std::size_t mask = places_.size() - 1;
  std::size_t at = homeOf(reporterID);
  while (places_[at].session != nullptr && places_[at].reporterID != reporterID) at = (at + 1) & mask;
  return at;
}

void SessionIndex::resize(std::size_t places) {
  std::vector<Place> old = std::exchange(places_, std::vector<Place>(places));
  for (Place& place : old) {
    if (place.session != nullptr) places_[placeOf(place.reporterID)] = std::move(place);
  }
}

// Moves later places up, so that no search ends at the free one too early.
void SessionIndex::free(std::size_t place) {
  const std::size_t mask = places_.size() - 1;
  std::size_t hole = place;
  for (std::size_t at = (hole + 1) & mask; places_[at].session != nullptr; at = (at + 1) & mask) {
    const std::size_t distance = (at - homeOf(places_[at].reporterID)) & mask;
    if (distance < ((at - hole) & mask)) continue;  // the search for it begins behind the hole
    places_[hole] = std::move(places_[at]);
    hole = at;
  }
  places_[hole] = {};
  --used_;
  if (places_.size() > kFewestPlaces && used_ < places_.size() / 8) resize(places_.size() / 2);
}

void SessionIndex::set(ReporterID reporterID, ClientNumber client, Session session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  Place& found = places_[placeOf(reporterID)];
  if (found.session == nullptr) {
    if (2 * (used_ + 1) > places_.size()) resize(2 * places_.size());
    ++used_;
    places_[placeOf(reporterID)] = {reporterID, client, std::move(session)};
  } else if (found.client == client) {
    found.session = std::move(session);
  } else if (client < found.client) {
    others_[reporterID].emplace(std::exchange(found.client, client),
                                std::exchange(found.session, std::move(session)));
  } else {
    others_[reporterID].insert_or_assign(client, std::move(session));
  }
}

void SessionIndex::remove(ReporterID reporterID, ClientNumber client) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const std::size_t place = placeOf(reporterID);
  Place& found = places_[place];
  if (found.session == nullptr) return;
  const auto others = others_.find(reporterID);
  if (found.client != client) {
    if (others != others_.end()) others->second.erase(client);
  } else if (others == others_.end()) {
    free(place);
  } else {
    auto next = others->second.extract(others->second.begin());
    found.client = next.key();
    found.session = std::move(next.mapped());
  }
  if (others != others_.end() && others->second.empty()) others_.erase(others);
}

void SessionIndex::expect(ReporterID reporterID) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (used_ <= kFewSessions) return;
  prefetch(&places_[homeOf(reporterID)]);
  const Place& next = places_[placeOf(expected_[0])];
  if (next.session != nullptr) next.session->prefetchItself();
  const Place& nearest = places_[placeOf(expected_[1])];
  if (nearest.session != nullptr) nearest.session->prefetchForMessage();
  expected_ = {reporterID, expected_[0]};
}

SessionIndex::Session SessionIndex::find(ReporterID reporterID) const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  return places_[placeOf(reporterID)].session;
}

SessionIndex::Found SessionIndex::findWithClient(ReporterID reporterID) const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const Place& place = places_[placeOf(reporterID)];
  return {place.session, place.client};
}

}  // namespace tonewerk
