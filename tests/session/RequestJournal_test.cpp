// SPDX-License-Identifier: Apache-2.0
#include "session/RequestJournal.h"

#include <gmock/gmock.h>
#include <limits>
#include <memory>

#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJournal.h"

namespace tonewerk {
namespace {

using testing::Eq;
using testing::Optional;
using testing::SizeIs;

constexpr std::uint64_t kNothing = std::numeric_limits<std::uint64_t>::max();

class RequestJournalTest : public testing::Test {
 protected:
  RequestJournal::Client clientOf(std::int32_t process) {
    RequestJournal::Client client{.process = process, .user = 1000};
    journal.keepConnection(client, "player");
    return client;
  }

  const std::shared_ptr<MemoryJournalDisk> disk = std::make_shared<MemoryJournalDisk>();
  MemoryJournal memory{disk};
  ManualClock clock;
  RequestJournal journal{&memory, clock};
};

TEST_F(RequestJournalTest, AClientsNumberIsThatOfItsFirstRecord) {
  RequestJournal::Client first = clientOf(11);
  RequestJournal::Client second = clientOf(12);
  EXPECT_EQ(first.number, 1U);
  EXPECT_EQ(second.number, 2U);
  EXPECT_EQ(journal.keepConnection(first, "player"), 3U);
  EXPECT_EQ(first.number, 1U);
}

TEST_F(RequestJournalTest, ARequestIsKeptWithItsTimeUserAndClient) {
  RequestJournal::Client client = clientOf(11);
  clock.setNow(1234.5);
  EXPECT_EQ(journal.keep(client, "frame"), 2U);
  ASSERT_TRUE(memory.write());
  const auto& kept = disk->records.at(2);
  EXPECT_EQ(kept.bytes, "frame");
  EXPECT_EQ(kept.origin.at, 1234.5);
  EXPECT_EQ(kept.origin.client, client.number);
  EXPECT_EQ(kept.origin.user, 1000U);
}

TEST_F(RequestJournalTest, TheOldestOpenSessionSaysWhatIsNeeded) {
  const RequestJournal::Client client = clientOf(11);
  EXPECT_EQ(journal.neededFrom(), kNothing);
  journal.opened(client, 77, 5);
  journal.opened(client, 78, 9);
  EXPECT_EQ(journal.neededFrom(), 5U);
  journal.closed(client, 77);
  EXPECT_EQ(journal.neededFrom(), 9U);
  journal.closed(client, 78);
  journal.closed(client, 78);
  EXPECT_EQ(journal.neededFrom(), kNothing);
}

TEST_F(RequestJournalTest, ASessionThatIsMadeAgainIsNeededFromItsLastBegin) {
  const RequestJournal::Client client = clientOf(11);
  journal.opened(client, 77, 5);
  journal.opened(client, 77, 9);
  EXPECT_EQ(journal.neededFrom(), 9U);
}

TEST_F(RequestJournalTest, ALaterSessionOfSingleMessagesStaysOpen) {
  journal.willDrop(3);
  journal.openedSingleMessages(1000, 3);
  journal.willDrop(7);
  journal.openedSingleMessages(1000, 8);
  EXPECT_EQ(journal.neededFrom(), 3U);
  journal.closedSingleMessages(1000, 3);
  EXPECT_EQ(journal.neededFrom(), 7U);
  journal.closedSingleMessages(1000, 8);
  EXPECT_EQ(journal.neededFrom(), kNothing);
}

TEST_F(RequestJournalTest, TheOldestSessionsCanBeUncovered) {
  const RequestJournal::Client client = clientOf(11);
  journal.opened(client, 77, 5);
  journal.opened(client, 78, 9);
  journal.opened(client, 79, 12);
  EXPECT_EQ(journal.uncoverBefore(5), 0U);
  EXPECT_EQ(journal.uncoverBefore(10), 2U);
  EXPECT_EQ(journal.neededFrom(), 12U);
  journal.closed(client, 77);
  EXPECT_EQ(journal.uncoverBefore(10), 0U);
}

TEST_F(RequestJournalTest, SessionsMayNeedTheSameRecords) {
  const RequestJournal::Client client = clientOf(11);
  journal.opened(client, 77, 5);
  journal.opened(client, 78, 5);
  journal.closed(client, 77);
  EXPECT_EQ(journal.neededFrom(), 5U);
  journal.closed(client, 78);
  EXPECT_EQ(journal.neededFrom(), kNothing);
}

TEST_F(RequestJournalTest, AConnectionIsNeededThatWasToldAfterAllOpenSessionsBegan) {
  const RequestJournal::Client client = clientOf(11);
  EXPECT_EQ(journal.connectionsNeededFrom(), 0U);
  journal.opened(client, 77, 5);
  EXPECT_EQ(journal.connectionsNeededFrom(), 5U);
  journal.closed(client, 77);
  EXPECT_EQ(journal.connectionsNeededFrom(), 5U);
  journal.willDrop(8);
  EXPECT_EQ(journal.connectionsNeededFrom(), 8U);
}

TEST_F(RequestJournalTest, SingleMessagesNeedTheConnectionsToldBefore) {
  journal.willDrop(5);
  journal.openedSingleMessages(1000, 8);
  EXPECT_EQ(journal.neededFrom(), 5U);
}

TEST_F(RequestJournalTest, TheWatcherLearnsOfTheNextRecordAndOfThoseAboveASize) {
  int calls = 0;
  RequestJournal::Client client = clientOf(11);
  journal.setWatcher([&] { ++calls; });
  journal.keep(client, "frame");
  EXPECT_EQ(calls, 0);
  journal.watchNext(true);
  journal.keep(client, "frame");
  EXPECT_EQ(calls, 1);
  journal.watchNext(false);
  journal.watchAbove(memory.bytes());
  journal.keep(client, "frame");
  EXPECT_EQ(calls, 2);
}

TEST_F(RequestJournalTest, APositionHasTheTimeOfItsRequest) {
  RequestJournal::Client client = clientOf(11);
  clock.setNow(1234.5);
  const JournalPosition position = journal.position(journal.keep(client, "frame"));
  EXPECT_EQ(position.sequence(), 2U);
  EXPECT_EQ(position.at(), 1234.5);
  journal.play({.sequence = 40, .origin = {.at = 1000.25}});
  EXPECT_EQ(journal.position(journal.keep(client, "frame")).at(), 1000.25);
}

TEST_F(RequestJournalTest, WhatIsPlayedIsNotKeptAgain) {
  journal.play({.sequence = 40, .origin = {.client = 33}});
  RequestJournal::Client client{.process = 11, .user = 1000};
  EXPECT_EQ(journal.keepConnection(client, "player"), 40U);
  EXPECT_EQ(client.number, 33U);
  EXPECT_EQ(journal.keep(client, "frame"), 40U);
  EXPECT_EQ(journal.keepEnd(client), 40U);
  EXPECT_EQ(memory.last(), 0U);
  journal.endPlaying();
  EXPECT_EQ(journal.keepEnd(client), 1U);
}

TEST_F(RequestJournalTest, ReportsAreCountedDuringARecovery) {
  EXPECT_EQ(journal.countReport("a.json"), 0U);
  journal.play({.sequence = 40});
  EXPECT_EQ(journal.countReport("a.json"), 1U);
  journal.endPlaying();
  EXPECT_EQ(journal.countReport("a.json"), 2U);
  EXPECT_EQ(journal.countReport("b.json"), 1U);
  journal.endRecovery();
  EXPECT_EQ(journal.countReport("a.json"), 0U);
}

TEST_F(RequestJournalTest, WithoutAJournalNothingIsKept) {
  RequestJournal without(nullptr, clock);
  RequestJournal::Client client{.process = 11};
  EXPECT_FALSE(without.isOn());
  EXPECT_EQ(without.keepConnection(client, "player"), 0U);
  EXPECT_EQ(without.keep(client, "frame"), 0U);
  EXPECT_EQ(without.keepEnd(client), 0U);
  without.opened(client, 77, 0);
  EXPECT_EQ(without.neededFrom(), kNothing);
}

}  // namespace
}  // namespace tonewerk
