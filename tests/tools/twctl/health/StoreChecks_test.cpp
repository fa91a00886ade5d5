// SPDX-License-Identifier: Apache-2.0
#include <string>

#include "tools/twctl/health/CheckupTest.h"
#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

using testing::AllOf;
using testing::ElementsAre;
using testing::EndsWith;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

class StoreChecksTest : public CheckupTest {};

TEST_F(StoreChecksTest, FindNothingWhereAllIsWell) {
  checkup.store.newestAt = kNow - 5;
  EXPECT_THAT(find(checkClock), IsEmpty());
  EXPECT_THAT(find(checkStore), IsEmpty());
  EXPECT_THAT(find(checkReports), IsEmpty());
  EXPECT_THAT(unseen, IsEmpty());
}

TEST_F(StoreChecksTest, FindAClockThatIsNotSet) {
  checkup.daemon = {};
  checkup.around.now = 86'400.0;
  EXPECT_THAT(find(checkClock), ElementsAre(StartsWith("unset-clock: the clock shows 1970-01-0")));
}

TEST_F(StoreChecksTest, FindAClockThatHasJumped) {
  checkup.daemon.daemon.set("startedAt", kNow - 100 - 3 * 3600);
  EXPECT_THAT(find(checkClock),
              ElementsAre("jumped-clock: the clock has jumped ahead by 3 h 0 min since the daemon's start"));
  checkup.daemon.daemon.set("startedAt", kNow - 100 + 120);
  EXPECT_THAT(find(checkClock),
              ElementsAre("jumped-clock: the clock has jumped back by 2 min since the daemon's start"));
}

TEST_F(StoreChecksTest, FindReportsFromTheFuture) {
  checkup.store.newestAt = kNow + 3600;
  EXPECT_THAT(find(checkClock), ElementsAre(StartsWith("future-reports: ")));
}

TEST_F(StoreChecksTest, FindADiskWithLessRoomThanTheStoreMayTake) {
  checkup.store.bytes = 100 * static_cast<std::uint64_t>(kMebibyte);
  freeBytes = 156 * static_cast<std::uint64_t>(kMebibyte);
  EXPECT_THAT(find(checkStore), IsEmpty());
  freeBytes = 100 * static_cast<std::uint64_t>(kMebibyte);
  EXPECT_THAT(find(checkStore),
              ElementsAre(AllOf(StartsWith("full-disk: "),
                                EndsWith("has 100.0 MiB left, and the store may still take 156.0 MiB"))));
  EXPECT_THAT(remedies, ElementsAre("twctl defaults write com.orvane.tonewerk.store max_megabytes 150"));
}

TEST_F(StoreChecksTest, FindAStoreThatCannotBeRead) {
  checkup.store.problem = "file is not a database";
  EXPECT_THAT(find(checkStore), ElementsAre(StartsWith("unreadable-store: ")));
  checkup.store.isForbidden = true;
  EXPECT_THAT(find(checkStore), IsEmpty());
  EXPECT_THAT(unseen, SizeIs(1)) << "it is somebody else's";
}

TEST_F(StoreChecksTest, FindWhatEarlierDaemonsHaveLeft) {
  checkup.store.hasDamagedCopy = true;
  checkup.store.newerSchema = 9;
  EXPECT_THAT(find(checkStore),
              ElementsAre(StartsWith("newer-store: a daemon with schema 9 "), StartsWith("damaged-store: ")));
  EXPECT_EQ(remedies[1], "rm " + checkup.store.path + ".corrupt");
}

TEST_F(StoreChecksTest, FindSinksThatHangOrHaveDropped) {
  checkup.daemon.sinks =
      ValueArray{ValueMap{{"name", "store"}, {"waiting", 5}, {"dropped", 0}, {"hangs", 41}},
                 ValueMap{{"name", "log"}, {"waiting", 0}, {"dropped", 3}, {"hangs", 0}},
                 ValueMap{{"name", "jsonFiles"}, {"waiting", 9}, {"dropped", 0}, {"hangs", 0}}};
  EXPECT_THAT(find(checkReports), ElementsAre("hanging-sink: store has made no progress for 41 s",
                                              "dropping-sink: log has dropped 3 since the daemon's start"));
  EXPECT_EQ(remedies[0], "df -h " + checkup.directories.state);
}

TEST_F(StoreChecksTest, FindAUserWhoWasRefusedMore) {
  const ValueArray resources{ValueMap{{"name", "keptBytes"}, {"held", 1}, {"share", 2}, {"refused", 4}},
                             ValueMap{{"name", "sinkBytes"}, {"held", 1}, {"share", 2}, {"refused", 9}}};
  checkup.daemon.accounts = ValueArray{ValueMap{{"user", 3'999'999}, {"resources", resources}}};
  EXPECT_THAT(find(checkReports), ElementsAre("refused-user: 3999999 was refused more of keptBytes 4 times"));
  EXPECT_THAT(remedies, ElementsAre("twctl defaults write com.orvane.tonewerk.service kept_megabytes 1024; "
                                    "systemctl --user reload twreportingd.service"));
}

TEST_F(StoreChecksTest, FindWhatProgramsHaveDropped) {
  const StoreFixture store;
  store.run(
      "CREATE TABLE analytics_row (id INTEGER PRIMARY KEY, recorded_at REAL, payload TEXT);"
      "INSERT INTO analytics_row VALUES (1, 1799999000.0, '{\"twreporting_dropped\":7}'), "
      "(2, 1799000000.0, '{\"twreporting_dropped\":5}')");
  checkup.store = readStoreFacts(store.state());
  EXPECT_THAT(find(checkReports),
              ElementsAre("lost-messages: programs have dropped 7 messages in the last day"));
}

TEST_F(StoreChecksTest, FindSessionsOfWhichNoneIsStarted) {
  checkup.daemon.sessions = ValueArray{ValueMap{{"reporterID", 7}, {"started", false}}};
  EXPECT_THAT(find(checkReports), ElementsAre("idle-sessions: none of 1 sessions is started"));
  checkup.daemon.sessions = ValueArray{ValueMap{{"reporterID", 7}, {"started", false}},
                                       ValueMap{{"reporterID", 8}, {"started", true}}};
  EXPECT_THAT(find(checkReports), IsEmpty());
}

TEST_F(StoreChecksTest, FindErrorsOfTheDaemonInTheLastHour) {
  checkup.daemon.troubles =
      ValueArray{ValueMap{{"time", kNow - 60}, {"text", "cannot write"}, {"times", 1}},
                 ValueMap{{"time", kNow - 90}, {"text", "cannot read"}, {"times", 2}},
                 ValueMap{{"time", kNow - 60}, {"text", "too many keys"}, {"times", 1}, {"user", 1000}},
                 ValueMap{{"time", kNow - 7200}, {"text", "long ago"}, {"times", 1}}};
  EXPECT_THAT(find(checkReports), ElementsAre(AllOf(StartsWith("logged-errors: 3 errors, the newest: "),
                                                    EndsWith(" cannot write"))));
  EXPECT_THAT(remedies, ElementsAre("journalctl --user -u twreportingd -p err --since -1h"));
}

TEST_F(StoreChecksTest, SayWhatOnlyTrustedUsersSee) {
  checkup.daemon.sinks.reset();
  EXPECT_THAT(find(checkReports), IsEmpty());
  EXPECT_THAT(unseen, ElementsAre(testing::HasSubstr("trusted users only")));
}

}  // namespace
}  // namespace tonewerk
