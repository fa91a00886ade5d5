// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/StoreFacts.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>

#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

class StoreFactsTest : public testing::Test {
 protected:
  StoreFactsTest() {
    store.run(
        "CREATE TABLE analytics_row (id INTEGER PRIMARY KEY, recorded_at REAL, payload TEXT);"
        "CREATE TABLE metric (id INTEGER PRIMARY KEY, posted_at REAL);"
        "CREATE TABLE power_event (id INTEGER PRIMARY KEY, recorded_at REAL)");
  }

  StoreFixture store;
};

TEST_F(StoreFactsTest, TellHowLargeAndHowOldAStoreIs) {
  store.run(
      "INSERT INTO analytics_row VALUES (1, 5000.0, '{}'), (2, 7000.0, '{}'), (3, 9000.0, '{}');"
      "INSERT INTO metric VALUES (1, 4000.0)");
  const StoreFacts facts = readStoreFacts(store.state());
  EXPECT_TRUE(facts.exists);
  EXPECT_EQ(facts.path, store.file());
  EXPECT_EQ(facts.problem, "");
  EXPECT_EQ(facts.oldestAt, 4000.0);
  EXPECT_EQ(facts.newestAt, 9000.0);
  EXPECT_EQ(facts.bytes, std::filesystem::file_size(store.file()));
}

TEST_F(StoreFactsTest, TellByHowMuchItGrowsADay) {
  StoreFacts facts;
  facts.bytes = 1000;
  EXPECT_EQ(facts.bytesPerDay(1000.0), std::nullopt) << "no rows";
  facts.oldestAt = 0.0;
  EXPECT_EQ(facts.bytesPerDay(3599.0), std::nullopt) << "too young to tell";
  EXPECT_EQ(facts.bytesPerDay(2 * 86'400.0), 500.0);
}

TEST_F(StoreFactsTest, TellThatThereIsNoStoreOrThatItIsEmpty) {
  EXPECT_EQ(readStoreFacts(store.state()).oldestAt, std::nullopt);
  const StoreFacts facts = readStoreFacts(store.state() + "/nowhere");
  EXPECT_FALSE(facts.exists);
  EXPECT_EQ(facts.problem, "");
}

TEST_F(StoreFactsTest, TellWhyAStoreCannotBeRead) {
  std::ofstream(store.file()) << "this is no database, and long enough to be seen as a file of its own kind";
  EXPECT_NE(readStoreFacts(store.state()).problem, "");
}

TEST_F(StoreFactsTest, SeeADamagedCopy) {
  EXPECT_FALSE(readStoreFacts(store.state()).hasDamagedCopy);
  std::ofstream(store.file() + ".corrupt") << "x";
  EXPECT_TRUE(readStoreFacts(store.state()).hasDamagedCopy);
}

TEST_F(StoreFactsTest, CountWhatProgramsSayTheyHaveDropped) {
  store.run(
      "INSERT INTO analytics_row VALUES (1, 10.0, '{\"twreporting_dropped\":7}'), "
      "(2, 20.0, '{\"twreporting_dropped\":2}'), (3, 21.0, '{\"other\":\"twreporting_dropped\"}'), "
      "(4, 22.0, '{\"twreporting_dropped\":1}')");
  EXPECT_EQ(messagesDroppedByPrograms(readStoreFacts(store.state()), 15.0), 3);
  EXPECT_EQ(messagesDroppedByPrograms(readStoreFacts(store.state()), 30.0), 0);
  EXPECT_EQ(messagesDroppedByPrograms(readStoreFacts(store.state() + "/nowhere"), 0.0), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
