// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/StoreNames.h"

#include <gmock/gmock.h>

#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

class StoreNamesTest : public testing::Test {
 protected:
  void open() { EXPECT_EQ(reader.open(fixture.file()), ""); }

  StoreFixture fixture;
  SqlReader reader;
};

TEST_F(StoreNamesTest, NamesViewsForPeopleOrElseTables) {
  fixture.run("CREATE TABLE row_a (at REAL); CREATE TABLE row_b (at REAL)");
  open();
  EXPECT_THAT(readableNamesOf(reader), ElementsAre("row_a", "row_b"));
  fixture.run("CREATE VIEW event AS SELECT at FROM row_a");
  EXPECT_THAT(readableNamesOf(reader), ElementsAre("event"));
  EXPECT_THAT(tablesOf(reader), ElementsAre("row_a", "row_b"));
}

TEST_F(StoreNamesTest, FindsANameInAnyCase) {
  fixture.run("CREATE TABLE \"odd \"\"name\" (at REAL)");
  open();
  EXPECT_EQ(nameInStore(reader, "ODD \"NAME"), "odd \"name");
  EXPECT_EQ(nameInStore(reader, "odd"), std::nullopt);
  EXPECT_EQ(sqlName("odd \"name"), "\"odd \"\"name\"");
  EXPECT_EQ(definitionOf(reader, "odd \"name"), "CREATE TABLE \"odd \"\"name\" (at REAL)");
}

TEST_F(StoreNamesTest, FindsTheTimeOfARow) {
  EXPECT_EQ(timeColumnOf({{"id", ""}, {"ended_at", ""}, {"started_at", ""}}), "started_at");
  EXPECT_EQ(timeColumnOf({{"recorded_at", ""}, {"at", ""}}), "at");
  EXPECT_EQ(timeColumnOf({{"id", ""}}), std::nullopt);
}

TEST_F(StoreNamesTest, FindsTheTimesOfTheOldestAndTheNewestRows) {
  fixture.run(
      "CREATE TABLE analytics_row (id INTEGER PRIMARY KEY, recorded_at REAL); CREATE TABLE other (name TEXT);"
      "CREATE TABLE metric (id INTEGER PRIMARY KEY, posted_at REAL);");
  open();
  EXPECT_FALSE(spanOf(reader));
  fixture.run("INSERT INTO analytics_row VALUES (7, 100.5), (9, 300); INSERT INTO metric VALUES (1, 50.25)");
  const std::optional<StoreSpan> span = spanOf(reader);
  ASSERT_TRUE(span);
  EXPECT_EQ(span->from, 50.25);
  EXPECT_EQ(span->until, 300.0);
}

}  // namespace
}  // namespace tonewerk
