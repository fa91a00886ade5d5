// SPDX-License-Identifier: Apache-2.0
#include "service/JournalUpkeep.h"

#include <gmock/gmock.h>
#include <memory>

#include "session/RequestJournal.h"
#include "support/ReportingTest.h"
#include "support/memory/MemoryJournal.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::SizeIs;
using Operation = MemoryJournal::Operation;

class JournalUpkeepTest : public ReportingTest {
 protected:
  JournalUpkeepTest() {
    test.journal = &memory;
    useWorkers({});
    upkeep = std::make_unique<JournalUpkeep>(
        memory, *context,
        JournalUpkeep::Reports{.recorded = [this] { return recorded; },
                               .areWritten = [this](std::uint64_t rows) { return rows <= written; },
                               .sync =
                                   [this] {
                                     ++reportSyncs;
                                     return areReportsSynced;
                                   }},
        [this] { return bounds; });
  }
  ~JournalUpkeepTest() override {
    upkeep.reset();
    test.queues.runAll();
  }

  void append(int count) {
    for (int record = 0; record < count; ++record) {
      context->journal().keep(client, "0123456789");
      ASSERT_TRUE(memory.write());
    }
    test.queues.runAll();
  }
  void tick() {
    test.clock.advance(5.0);
    test.queues.runAll();
  }

  const std::shared_ptr<MemoryJournalDisk> disk = std::make_shared<MemoryJournalDisk>();
  MemoryJournal memory{disk};
  std::uint64_t recorded = 0;
  std::uint64_t written = 0;
  bool areReportsSynced = true;
  int reportSyncs = 0;
  RequestJournal::Client client{.process = 11, .user = 1000, .number = 1};
  JournalUpkeep::Bounds bounds;
  std::unique_ptr<JournalUpkeep> upkeep;
};

TEST_F(JournalUpkeepTest, ATickAfterARecordSyncs) {
  append(1);
  tick();
  EXPECT_EQ(memory.uses(Operation::kSync), 1U);
}

TEST_F(JournalUpkeepTest, WithoutRecordsNothingTicks) {
  tick();
  EXPECT_EQ(memory.uses(Operation::kSync), 0U);
}

TEST_F(JournalUpkeepTest, TicksEndWhenThereIsNothingMoreToDropAndBeginWithTheNextRecord) {
  append(3);
  for (int ticks = 0; ticks < 5; ++ticks) tick();
  const std::size_t syncs = memory.uses(Operation::kSync);
  for (int ticks = 0; ticks < 5; ++ticks) tick();
  EXPECT_EQ(memory.uses(Operation::kSync), syncs);
  append(1);
  tick();
  EXPECT_EQ(memory.uses(Operation::kSync), syncs + 1);
}

TEST_F(JournalUpkeepTest, RecordsOfNoOpenSessionAreDroppedWhenTheirReportsAreWritten) {
  append(3);
  recorded = 10;
  tick();
  written = 9;
  tick();
  EXPECT_THAT(disk->records, SizeIs(3));
  written = 10;
  tick();
  EXPECT_THAT(disk->records, SizeIs(0));
}

TEST_F(JournalUpkeepTest, NothingIsDroppedBeforeTheReportsAreOnTheDisk) {
  areReportsSynced = false;
  append(3);
  tick();
  tick();
  tick();
  EXPECT_EQ(reportSyncs, 2);
  EXPECT_THAT(disk->records, SizeIs(3));
  areReportsSynced = true;
  tick();
  EXPECT_THAT(disk->records, SizeIs(0));
}

TEST_F(JournalUpkeepTest, RecordsSinceTheOldestOpenSessionStay) {
  append(5);
  context->journal().opened(client, 77, 3);
  tick();
  tick();
  EXPECT_THAT(disk->records, SizeIs(3));
  EXPECT_TRUE(disk->records.contains(3));
}

TEST_F(JournalUpkeepTest, ASessionThatOpensAfterTheLookIsNotDropped) {
  append(2);
  tick();
  append(1);
  context->journal().opened({.process = 11, .user = 1000, .number = 3}, 77, 3);
  tick();
  EXPECT_THAT(disk->records, SizeIs(1));
}

TEST_F(JournalUpkeepTest, AClientTellsItsConnectionAgainWhenItsRecordMayGo) {
  append(4);
  EXPECT_EQ(context->journal().connectionsNeededFrom(), 0U);
  tick();
  EXPECT_EQ(context->journal().connectionsNeededFrom(), 5U);
}

TEST_F(JournalUpkeepTest, AboveItsBoundTheOldestSessionsAreNotCoveredAnyMoreWhichIsSaidOnce) {
  append(1);
  bounds.bytes = 10 * memory.bytes();
  tick();
  for (ReporterID session = 1; session <= 40; ++session) {
    append(1);
    context->journal().opened(client, session, memory.last());
    EXPECT_LE(memory.bytes(), bounds.bytes);
  }
  EXPECT_GT(context->journal().neededFrom(), 30U);
  EXPECT_EQ(context->journal().neededFrom(), disk->records.begin()->first);
  EXPECT_THAT(test.log.textsAt(LogLevel::kError),
              testing::Contains(HasSubstr("the journal has reached its")).Times(1));
}

TEST_F(JournalUpkeepTest, AboveItsBoundItIsCutAlsoWhenNoReportIsEverWritten) {
  append(1);
  bounds.bytes = 10 * memory.bytes();
  recorded = 1;
  tick();
  for (int record = 0; record < 40; ++record) {
    append(1);
    EXPECT_LE(memory.bytes(), bounds.bytes);
  }
  EXPECT_FALSE(disk->records.empty());
  EXPECT_THAT(test.log.textsAt(LogLevel::kError),
              testing::ElementsAre(HasSubstr("what the sinks have not written would not outlive a crash")));
}

TEST_F(JournalUpkeepTest, NearItsBoundItDropsWhatIsWrittenWithoutWaitingForATick) {
  append(1);
  bounds.bytes = 100 * memory.bytes();
  tick();
  for (int record = 0; record < 400; ++record) append(1);
  EXPECT_LT(memory.bytes(), bounds.bytes);
  EXPECT_THAT(test.log.textsAt(LogLevel::kError), testing::IsEmpty());
}

TEST_F(JournalUpkeepTest, AtTheEndEverythingIsDroppedAtOnce) {
  append(3);
  upkeep->dropNow();
  EXPECT_THAT(disk->records, SizeIs(0));
}

}  // namespace
}  // namespace tonewerk
