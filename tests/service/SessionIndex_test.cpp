// SPDX-License-Identifier: Apache-2.0
#include "service/SessionIndex.h"

#include <gmock/gmock.h>
#include <map>
#include <random>

#include "session/TWReportingSession.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

class SessionIndexTest : public ReportingTest {
 protected:
  SessionIndexTest() : ReportingTest({}) {}

  static SessionIndex::Session make(ReporterID reporterID) {
    return TWReportingSession::initWithID(reporterID, {1});
  }

  SessionIndex index;
};

TEST_F(SessionIndexTest, FindsNothingUnderAnUnknownIdentifier) {
  EXPECT_EQ(index.find(7), nullptr);
  index.remove(7, 1);
  EXPECT_EQ(index.find(7), nullptr);
}

TEST_F(SessionIndexTest, FindsTheSessionThatReplacedAnother) {
  const auto first = make(7);
  const auto second = make(7);
  index.set(7, 1, first);
  index.set(7, 1, second);
  EXPECT_EQ(index.find(7), second);
}

TEST_F(SessionIndexTest, FindsTheSessionOfTheClientThatConnectedFirst) {
  const auto early = make(7);
  const auto late = make(7);
  index.set(7, 2, late);
  index.set(7, 1, early);
  EXPECT_EQ(index.find(7), early);
  index.remove(7, 1);
  EXPECT_EQ(index.find(7), late);
}

TEST_F(SessionIndexTest, RemovesOnlyTheClientsOwnSession) {
  const auto early = make(7);
  index.set(7, 1, early);
  index.remove(7, 2);
  EXPECT_EQ(index.find(7), early);
}

// Clients that come and go, against a walk over all clients in order of connection.
TEST_F(SessionIndexTest, AgreesWithAWalkOverTheClients) {
  std::mt19937 random(5);
  std::map<SessionIndex::ClientNumber, std::map<ReporterID, SessionIndex::Session>> clients;
  const auto walk = [&clients](ReporterID reporterID) -> SessionIndex::Session {
    for (const auto& [number, sessions] : clients) {
      const auto found = sessions.find(reporterID);
      if (found != sessions.end()) return found->second;
    }
    return nullptr;
  };
  for (int step = 0; step < 3000; ++step) {
    const auto reporterID = static_cast<ReporterID>(random() % 6);
    const SessionIndex::ClientNumber client = random() % 5;
    if (random() % 2 == 0) {
      const auto session = make(reporterID);
      clients[client][reporterID] = session;
      index.set(reporterID, client, session);
    } else {
      clients[client].erase(reporterID);
      index.remove(reporterID, client);
    }
    for (ReporterID wanted = 0; wanted < 6; ++wanted) ASSERT_EQ(index.find(wanted), walk(wanted)) << step;
  }
}

// So that the index grows, shrinks, and closes gaps between identifiers that share places.
TEST_F(SessionIndexTest, AgreesWithAMapOfManyIdentifiersThatComeAndGo) {
  constexpr ReporterID kIdentifiers = 600;
  std::mt19937 random(11);
  const auto anyIdentifier = [&random] { return static_cast<ReporterID>(random() % kIdentifiers); };
  std::map<ReporterID, SessionIndex::Session> sessions;
  for (const double share : {0.9, 0.02, 0.5, 0.0}) {
    for (ReporterID step = 0; step < 3 * kIdentifiers; ++step) {
      const ReporterID reporterID = anyIdentifier();
      if (std::bernoulli_distribution(share)(random)) {
        sessions[reporterID] = make(reporterID);
        index.set(reporterID, 1, sessions[reporterID]);
      } else {
        sessions.erase(reporterID);
        index.remove(reporterID, 1);
      }
      index.expect(anyIdentifier());  // changes nothing, also for sessions that end meanwhile
    }
    for (ReporterID wanted = 0; wanted < kIdentifiers; ++wanted) {
      const auto found = sessions.find(wanted);
      ASSERT_EQ(index.find(wanted), found == sessions.end() ? nullptr : found->second) << wanted;
    }
  }
}

}  // namespace
}  // namespace tonewerk
