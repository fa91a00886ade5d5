// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreMetricon.h"

#include <gmock/gmock.h>
#include <optional>
#include <string>

#include "platform/Log.h"
#include "platform/linux/store/ReportStore.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

ValueMap consumer(const char* name, std::initializer_list<Value> events) {
  return {{"name", name}, {"events", ValueArray(events)}};
}

class StoreMetriconTest : public testing::Test {
 protected:
  void configureConsumers(const Value& consumers) {
    preferences_.configure("com.orvane.metricon", "consumers", consumers);
    clock_.advance(1.0);
  }
  std::optional<std::int64_t> recorded(const std::string& name) {
    EXPECT_TRUE(store_.flush(std::chrono::seconds(30)));
    SqliteDatabase database;
    EXPECT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly,
                              std::chrono::seconds(30)));
    return database.number("SELECT count(*) FROM analytics_event WHERE name = '" + name + "'");
  }
  std::vector<std::string> errors() { return log_.textsOf("twrs", LogLevel::kError); }

  TemporaryDirectory directory_;
  ManualClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  ReportStore store_{directory_.path(), json_, preferences_, clock_, category_};
  StoreMetricon metricon_{store_, preferences_, clock_, category_};
};

TEST_F(StoreMetriconTest, TakesOurEventsWithoutAnyPreference) {
  EXPECT_TRUE(metricon_.isEventUsed("com.orvane.tonewerk.HAL_Playback.Stop"));
  EXPECT_FALSE(metricon_.isEventUsed("org.example.Playback.Stop"));
  EXPECT_FALSE(metricon_.isEventUsed("com.orvane"));
}

TEST_F(StoreMetriconTest, AsksForWhatTheConsumersAskFor) {
  configureConsumers(ValueArray{consumer("calls", {"com.orvane.telephony.*", "*.Error"}),
                                consumer("plots", {"com.orvane.?.[AB]"})});
  EXPECT_TRUE(metricon_.isEventUsed("com.orvane.telephony.Volume.Summary"));
  EXPECT_TRUE(metricon_.isEventUsed("com.orvane.alarms.IO.Error"));
  EXPECT_TRUE(metricon_.isEventUsed("com.orvane.x.B"));
  EXPECT_FALSE(metricon_.isEventUsed("com.orvane.x.C"));
  EXPECT_FALSE(metricon_.isEventUsed("com.orvane.alarms.IO.Stop"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(StoreMetriconTest, NobodyAsksWhenThereAreNoConsumers) {
  configureConsumers(ValueArray{});
  EXPECT_FALSE(metricon_.isEventUsed("com.orvane.tonewerk.IO.Stop"));
}

TEST_F(StoreMetriconTest, SeesAChangeWithinASecond) {
  EXPECT_FALSE(metricon_.isEventUsed("org.example.x"));
  preferences_.configure("com.orvane.metricon", "consumers", ValueArray{consumer("c", {"org.*"})});
  EXPECT_FALSE(metricon_.isEventUsed("org.example.x"));
  clock_.advance(1.0);
  EXPECT_TRUE(metricon_.isEventUsed("org.example.x"));
  EXPECT_FALSE(metricon_.isEventUsed("com.orvane.tonewerk.IO.Stop"));
}

TEST_F(StoreMetriconTest, SeesAChangeAtOnceWhenItIsToldToReadAgain) {
  EXPECT_FALSE(metricon_.isEventUsed("org.example.x"));
  preferences_.configure("com.orvane.metricon", "consumers", ValueArray{consumer("c", {"org.*"})});
  metricon_.readConsumersAgain();
  EXPECT_TRUE(metricon_.isEventUsed("org.example.x"));
}

TEST_F(StoreMetriconTest, SaysOnceWhatItCannotRead) {
  configureConsumers(ValueArray{5, consumer("good", {"org.*", 7}), ValueMap{{"name", "empty"}},
                                ValueMap{{"events", ValueArray{"net.*"}}}});
  EXPECT_TRUE(metricon_.isEventUsed("org.example.x"));
  EXPECT_FALSE(metricon_.isEventUsed("net.example.x"));
  clock_.advance(10.0);
  EXPECT_TRUE(metricon_.isEventUsed("org.example.x"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("entry 1 is no table"),
                                    HasSubstr("entry 2 (good) has a pattern that is no text: 7"),
                                    HasSubstr("entry 3 (empty) has no array of events"),
                                    HasSubstr("entry 4 has no name")));
}

TEST_F(StoreMetriconTest, SaysWhenTheConsumersAreNoArray) {
  configureConsumers("everybody");
  EXPECT_FALSE(metricon_.isEventUsed("com.orvane.tonewerk.IO.Stop"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("no array of tables: everybody")));
}

TEST_F(StoreMetriconTest, StillAnswersAfterMoreNamesThanItRemembers) {
  for (int n = 0; n < 10'000; ++n) {
    EXPECT_TRUE(metricon_.isEventUsed("com.orvane." + std::to_string(n)));
    EXPECT_FALSE(metricon_.isEventUsed("org." + std::to_string(n)));
  }
}

TEST_F(StoreMetriconTest, RecordsAnEventOnceHoweverManyAskForIt) {
  configureConsumers(ValueArray{consumer("a", {"com.orvane.*"}), consumer("b", {"com.orvane.x"})});
  metricon_.sendEvent("com.orvane.x", [] { return ValueMap{{"n", 1}}; });
  EXPECT_EQ(recorded("com.orvane.x"), 1);
}

TEST_F(StoreMetriconTest, NeitherRecordsNorMakesAPayloadNobodyAsksFor) {
  bool asked = false;
  metricon_.sendEvent("org.example.x", [&] {
    asked = true;
    return ValueMap();
  });
  EXPECT_FALSE(asked);
  metricon_.sendEvent("com.orvane.x", [] { return ValueMap(); });
  EXPECT_EQ(recorded("org.example.x"), 0);
  EXPECT_EQ(recorded("com.orvane.x"), 1);
}

}  // namespace
}  // namespace tonewerk
