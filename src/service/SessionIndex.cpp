// SPDX-License-Identifier: Apache-2.0
#include "service/SessionIndex.h"

#include <cassert>
#include <utility>

#include "session/TWReportingUtility.h"

namespace tonewerk {

void SessionIndex::set(ReporterID reporterID, ClientNumber client, Session session) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto [place, isNew] = sessions_.try_emplace(reporterID, Holders{client, nullptr, {}});
  Holders& holders = place->second;
  if (isNew || holders.firstClient == client) {
    holders.first = std::move(session);
  } else if (client < holders.firstClient) {
    holders.others.emplace(std::exchange(holders.firstClient, client),
                           std::exchange(holders.first, std::move(session)));
  } else {
    holders.others.insert_or_assign(client, std::move(session));
  }
}

void SessionIndex::remove(ReporterID reporterID, ClientNumber client) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto place = sessions_.find(reporterID);
  if (place == sessions_.end()) return;
  Holders& holders = place->second;
  if (holders.firstClient != client) {
    holders.others.erase(client);
  } else if (holders.others.empty()) {
    sessions_.erase(place);
  } else {
    auto next = holders.others.extract(holders.others.begin());
    holders.firstClient = next.key();
    holders.first = std::move(next.mapped());
  }
}

SessionIndex::Session SessionIndex::find(ReporterID reporterID) const {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto place = sessions_.find(reporterID);
  return place == sessions_.end() ? nullptr : place->second.first;
}

}  // namespace tonewerk
