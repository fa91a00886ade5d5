// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlCompletion.h"

#include <gmock/gmock.h>

#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;

class SqlCompletionTest : public testing::Test {
 protected:
  SqlCompletionTest() {
    fixture.run(
        "CREATE TABLE session (id INTEGER, service TEXT, seconds REAL);"
        "CREATE TABLE event (id INTEGER, session INTEGER); CREATE VIEW seldom AS SELECT 1 AS one;");
    EXPECT_EQ(reader.open(fixture.file()), "");
  }

  StoreFixture fixture;
  SqlReader reader;
};

TEST_F(SqlCompletionTest, OffersTablesAndViewsWhereTheyAreNamed) {
  const SqlCompletion completion(reader);
  EXPECT_THAT(completion.complete("SELECT * FROM se"), ElementsAre("seldom", "session"));
  EXPECT_THAT(completion.complete("select * from "), ElementsAre("event", "seldom", "session"));
  EXPECT_THAT(completion.complete("SELECT * FROM event JOIN SES"), ElementsAre("session"));
  EXPECT_THAT(completion.complete(".schema e"), ElementsAre("event"));
}

TEST_F(SqlCompletionTest, OffersColumnsAndWordsElsewhere) {
  const SqlCompletion completion(reader);
  EXPECT_THAT(completion.complete("se"), ElementsAre("SELECT", "seconds", "seldom", "service", "session"));
  EXPECT_THAT(completion.complete("SELECT s.sec"), ElementsAre("seconds"));
  EXPECT_THAT(completion.complete("SELECT sum(sec"), ElementsAre("seconds"));
  EXPECT_THAT(completion.complete("SELECT nothing_like_it"), IsEmpty());
  EXPECT_THAT(completion.complete(""), AllOf(Contains("SELECT"), Not(Contains(".help"))));
}

TEST_F(SqlCompletionTest, OffersCommandsAtTheBeginningOfALine) {
  const SqlCompletion completion(reader);
  EXPECT_THAT(completion.complete("."), ElementsAre(".help", ".quit", ".schema", ".tables"));
  EXPECT_THAT(completion.complete(".ta"), ElementsAre(".tables"));
  EXPECT_THAT(completion.complete("SELECT .ta"), IsEmpty());
}

TEST(CommonBeginTest, IsWhatAllWordsBeginWith) {
  EXPECT_EQ(commonBegin({"session", "seconds"}), "se");
  EXPECT_EQ(commonBegin({"SELECT", "session"}), "SE");
  EXPECT_EQ(commonBegin({"session"}), "session");
  EXPECT_EQ(commonBegin({"a", "b"}), "");
  EXPECT_EQ(commonBegin({}), "");
}

}  // namespace
}  // namespace tonewerk
