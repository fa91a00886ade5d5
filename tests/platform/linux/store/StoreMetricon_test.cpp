// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreMetricon.h"

#include <gmock/gmock.h>
#include <optional>
#include <string>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
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
  // Whether an event of this name is recorded.
  bool isUsed(const std::string& name) {
    bool asked = false;
    metricon_.sendEvent(name, {}, [&] {
      asked = true;
      return ValueMap();
    });
    return asked;
  }
  std::optional<std::int64_t> number(const std::string& sql) {
    EXPECT_TRUE(store_.flush(std::chrono::seconds(30)));
    SqliteDatabase database;
    EXPECT_TRUE(database.open(directory_.path("reports.db"), SqliteDatabase::Mode::kReadOnly,
                              std::chrono::seconds(30)));
    return database.number(sql);
  }
  std::optional<std::int64_t> recorded(const std::string& name) {
    return number("SELECT count(*) FROM analytics_event WHERE name = '" + name + "'");
  }
  std::vector<std::string> errors() { return log_.textsOf("twrs", LogLevel::kError); }

  TemporaryDirectory directory_;
  ManualClock clock_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  MemoryJsonService json_;
  MemoryPreferenceStore preferences_;
  Accounts accounts_{990, clock_};
  ReportStore store_{directory_.path(), json_, preferences_, clock_, accounts_, category_};
  StoreMetricon metricon_{store_, preferences_, clock_, category_};
};

TEST_F(StoreMetriconTest, UsesComOrvaneEventsWithoutAPreference) {
  EXPECT_TRUE(isUsed("com.orvane.tonewerk.HAL_Playback.Stop"));
  EXPECT_FALSE(isUsed("org.example.Playback.Stop"));
  EXPECT_FALSE(isUsed("com.orvane"));
}

TEST_F(StoreMetriconTest, UsesTheEventsThatConsumersAskFor) {
  configureConsumers(ValueArray{consumer("calls", {"com.orvane.telephony.*", "*.Error"}),
                                consumer("plots", {"com.orvane.?.[AB]"})});
  EXPECT_TRUE(isUsed("com.orvane.telephony.Volume.Summary"));
  EXPECT_TRUE(isUsed("com.orvane.alarms.IO.Error"));
  EXPECT_TRUE(isUsed("com.orvane.x.B"));
  EXPECT_FALSE(isUsed("com.orvane.x.C"));
  EXPECT_FALSE(isUsed("com.orvane.alarms.IO.Stop"));
  EXPECT_THAT(errors(), IsEmpty());
}

TEST_F(StoreMetriconTest, UsesNoEventWithoutConsumers) {
  configureConsumers(ValueArray{});
  EXPECT_FALSE(isUsed("com.orvane.tonewerk.IO.Stop"));
}

TEST_F(StoreMetriconTest, SeesAChangeWithinASecond) {
  EXPECT_FALSE(isUsed("org.example.x"));
  preferences_.configure("com.orvane.metricon", "consumers", ValueArray{consumer("c", {"org.*"})});
  EXPECT_FALSE(isUsed("org.example.x"));
  clock_.advance(1.0);
  EXPECT_TRUE(isUsed("org.example.x"));
  EXPECT_FALSE(isUsed("com.orvane.tonewerk.IO.Stop"));
}

TEST_F(StoreMetriconTest, SeesAChangeAtOnceWhenItReadsAgain) {
  EXPECT_FALSE(isUsed("org.example.x"));
  preferences_.configure("com.orvane.metricon", "consumers", ValueArray{consumer("c", {"org.*"})});
  metricon_.readConsumersAgain();
  EXPECT_TRUE(isUsed("org.example.x"));
}

TEST_F(StoreMetriconTest, LogsOnceWhatItCannotRead) {
  configureConsumers(ValueArray{5, consumer("good", {"org.*", 7}), ValueMap{{"name", "empty"}},
                                ValueMap{{"events", ValueArray{"net.*"}}}});
  EXPECT_TRUE(isUsed("org.example.x"));
  EXPECT_FALSE(isUsed("net.example.x"));
  clock_.advance(10.0);
  EXPECT_TRUE(isUsed("org.example.x"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("entry 1 is no table"),
                                    HasSubstr("entry 2 (good) has a pattern that is no text: 7"),
                                    HasSubstr("entry 3 (empty) has no array of events"),
                                    HasSubstr("entry 4 has no name")));
}

TEST_F(StoreMetriconTest, LogsWhenTheConsumersAreNoArray) {
  configureConsumers("everybody");
  EXPECT_FALSE(isUsed("com.orvane.tonewerk.IO.Stop"));
  EXPECT_THAT(errors(), ElementsAre(HasSubstr("no array of tables: everybody")));
}

TEST_F(StoreMetriconTest, StillAnswersAfterMoreNamesThanItRemembers) {
  for (int n = 0; n < 3000; ++n) {  // 6,000 names; it remembers 4,096
    EXPECT_TRUE(isUsed("com.orvane." + std::to_string(n)));
    EXPECT_FALSE(isUsed("org." + std::to_string(n)));
  }
}

TEST_F(StoreMetriconTest, RecordsAnEventOnceWhenSeveralConsumersAskForIt) {
  configureConsumers(ValueArray{consumer("a", {"com.orvane.*"}), consumer("b", {"com.orvane.x"})});
  metricon_.sendEvent("com.orvane.x", {}, [] { return ValueMap{{"n", 1}}; });
  EXPECT_EQ(recorded("com.orvane.x"), 1);
}

TEST_F(StoreMetriconTest, NeitherMakesNorRecordsAPayloadThatNoConsumerAsksFor) {
  bool asked = false;
  metricon_.sendEvent("org.example.x", {}, [&] {
    asked = true;
    return ValueMap();
  });
  EXPECT_FALSE(asked);
  metricon_.sendEvent("com.orvane.x", {}, [] { return ValueMap(); });
  EXPECT_EQ(recorded("org.example.x"), 0);
  EXPECT_EQ(recorded("com.orvane.x"), 1);
}

TEST_F(StoreMetriconTest, RecordsTwoNamesOfAnEventWithOnePayload) {
  int made = 0;
  metricon_.sendEvent({"com.orvane.x", "com.orvane.y"}, {}, [&] { return ValueMap{{"n", ++made}}; });
  EXPECT_EQ(made, 1);
  EXPECT_EQ(recorded("com.orvane.x"), 1);
  EXPECT_EQ(recorded("com.orvane.y"), 1);
  EXPECT_EQ(number("SELECT count(*) FROM analytics_row"), 1);
}

TEST_F(StoreMetriconTest, SeesAChangeForNamesThatItRemembers) {
  const EventNames names("com.orvane.x", "org.example.x");
  const auto send = [&](int n) { metricon_.sendEvent(names, {}, [n] { return ValueMap{{"n", n}}; }); };
  send(1);
  configureConsumers(ValueArray{consumer("c", {"org.*"})});
  send(2);
  configureConsumers(ValueArray{consumer("c", {"*"})});
  send(3);
  configureConsumers(ValueArray{});
  send(4);
  EXPECT_EQ(number("SELECT count(*) FROM analytics_event"), 4);
  EXPECT_EQ(number("SELECT count(*) FROM analytics_event WHERE name = 'com.orvane.x' AND"
                   " payload ->> 'n' IN (1, 3)"),
            2);
  EXPECT_EQ(number("SELECT count(*) FROM analytics_event WHERE name = 'org.example.x' AND"
                   " payload ->> 'n' IN (2, 3)"),
            2);
}

TEST_F(StoreMetriconTest, RecordsOnlyTheNameThatAConsumerAsksFor) {
  metricon_.sendEvent({"org.example.x", "com.orvane.x"}, {}, [] { return ValueMap{{"n", 1}}; });
  metricon_.sendEvent({"com.orvane.y", "org.example.y"}, {}, [] { return ValueMap{{"n", 2}}; });
  EXPECT_EQ(recorded("org.example.x"), 0);
  EXPECT_EQ(recorded("com.orvane.x"), 1);
  EXPECT_EQ(recorded("com.orvane.y"), 1);
  EXPECT_EQ(recorded("org.example.y"), 0);
}

}  // namespace
}  // namespace tonewerk
