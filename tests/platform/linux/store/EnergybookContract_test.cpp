// SPDX-License-Identifier: Apache-2.0
//
// The contract of power logs, tested with the one in the report store and its double in memory.
#include <gmock/gmock.h>
#include <string>
#include <thread>
#include <vector>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/StoreEnergybook.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"
#include "support/memory/reports/MemoryEnergybook.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::SizeIs;
using Event = MemoryEnergybook::Event;

class MemorySide {
 public:
  Energybook& energybook() { return energybook_; }
  std::vector<Event> events() { return energybook_.events(); }

 private:
  MemoryEnergybook energybook_;
};

class StoreSide {
 public:
  Energybook& energybook() { return energybook_; }
  ManualClock& clock() { return clock_; }

  std::vector<Event> events() {
    SqliteDatabase database;
    open(database);
    SqliteStatement select =
        database.prepare("SELECT event_group, name, payload FROM power_event ORDER BY id");
    std::vector<Event> found;
    while (select.step() == SqliteStatement::Step::kRow) {
      std::string problem;
      const auto payload = json_.parse(select.text(2), problem);
      EXPECT_TRUE(payload && payload->asMap()) << select.text(2) << ": " << problem;
      found.push_back({static_cast<std::int32_t>(select.integer(0)), select.text(1), *payload->asMap()});
    }
    return found;
  }
  std::optional<std::int64_t> number(const std::string& sql) {
    SqliteDatabase database;
    open(database);
    return database.number(sql);
  }

 private:
  void open(SqliteDatabase& database) {
    EXPECT_TRUE(store_.flush(std::chrono::seconds(30)));
    EXPECT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly,
                              std::chrono::seconds(30)))
        << database.problem();
  }

  TemporaryDirectory directory_;
  ManualClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  Accounts accounts_{990, clock_};
  ReportStore store_{directory_.path(), json_, preferences_, clock_, accounts_, category_};
  StoreEnergybook energybook_{store_, clock_};
};

template <typename Side>
class EnergybookContract : public testing::Test {
 protected:
  Side side_;
};

using Sides = testing::Types<MemorySide, StoreSide>;
TYPED_TEST_SUITE(EnergybookContract, Sides);

TYPED_TEST(EnergybookContract, RecordsGroupNameAndPayload) {
  const ValueMap payload{{"EngineOnDuration", 12.5}, {"ApplicationName", "com.orvane.game"}};
  this->side_.energybook().sendEvent(28, "Flumen_Haptics_EngineOnDuration", payload);
  EXPECT_THAT(this->side_.events(), ElementsAre(Event{28, "Flumen_Haptics_EngineOnDuration", payload}));
}

TYPED_TEST(EnergybookContract, RecordsEventsInTheirOrder) {
  for (int n = 0; n < 2500; ++n) this->side_.energybook().sendEvent(n % 3, "event", {{"n", n}});
  const auto events = this->side_.events();
  ASSERT_THAT(events, SizeIs(2500));
  for (int n = 0; n < 2500; ++n) {
    EXPECT_EQ(events[static_cast<std::size_t>(n)], (Event{n % 3, "event", {{"n", n}}}));
  }
}

TYPED_TEST(EnergybookContract, RecordsEventsWithTheSamePayloadSeparately) {
  const ValueMap payload{{"n", 1}};
  this->side_.energybook().sendEvent(1, "a", payload);
  this->side_.energybook().sendEvent(1, "b", payload);
  this->side_.energybook().sendEvent(2, "b", payload);
  EXPECT_THAT(this->side_.events(),
              ElementsAre(Event{1, "a", payload}, Event{1, "b", payload}, Event{2, "b", payload}));
}

TYPED_TEST(EnergybookContract, AcceptsEmptyNamesAndNegativeGroups) {
  this->side_.energybook().sendEvent(-1, "", {});
  EXPECT_THAT(this->side_.events(), ElementsAre(Event{-1, "", {}}));
}

TYPED_TEST(EnergybookContract, AcceptsEventsFromManyThreads) {
  std::vector<std::thread> threads;
  threads.reserve(4);
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([this, thread] {
      for (int n = 0; n < 250; ++n) this->side_.energybook().sendEvent(thread, "event", {{"n", n}});
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::vector<std::int64_t> next(4, 0);
  for (const Event& event : this->side_.events()) {
    EXPECT_EQ(event.payload.integer("n"), next.at(static_cast<std::size_t>(event.group))++);
  }
  EXPECT_THAT(next, ElementsAre(250, 250, 250, 250));
}

TEST(StoreEnergybookTest, RecordsTheTime) {
  StoreSide side;
  side.clock().setNow(1000.0);
  side.energybook().sendEvent(28, "a", {});
  side.clock().setNow(2000.0);
  side.energybook().sendEvent(28, "b", {});
  EXPECT_EQ(side.number("SELECT recorded_at FROM power_event WHERE name = 'a'"), 1000);
  EXPECT_EQ(side.number("SELECT recorded_at FROM power_event WHERE name = 'b'"), 2000);
}

}  // namespace
}  // namespace tonewerk
