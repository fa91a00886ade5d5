// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionReasons.h"

#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

ValueMap volumeMessage(std::int64_t number, double volume) {
  return {{"what", "message"},
          {"number", number},
          {"at", 10.0},
          {"category", "Volume"},
          {"type", "State"},
          {"redundant", false},
          {"derived", false},
          {"payload", ValueMap{{"QMSessionVolume", volume}, {"twreporting_timestamp", 10.0}}}};
}

ValueMap sessionSummary(double load) {
  return {{"what", "message"}, {"number", 9},
          {"at", 20.0},        {"category", "Session_Generic"},
          {"type", "Summary"}, {"redundant", false},
          {"derived", true},   {"payload", ValueMap{{"load_avg_1_min", load}}}};
}

StoredPayload volumeEvent(std::int64_t event, const std::string& volume) {
  return {event, "Volume", "State", "client", 10.004, "{\"QMSessionVolume\":" + volume + "}"};
}

std::vector<std::int64_t> eventsOf(const ReasonedLife& life) {
  std::vector<std::int64_t> events;
  for (const ValueMap& message : life.messages) events.push_back(message.integer(kMessageKeyEvent));
  return events;
}

class SessionReasonsTest : public testing::Test {
 protected:
  NlohmannJsonService json_;
  ReasonedLife life_;
};

// Messages of one moment were all taken for the first of them.
TEST_F(SessionReasonsTest, TellsMessagesOfTheSameTimeApart) {
  life_.messages = {volumeMessage(1, 0.1), volumeMessage(2, 0.2), volumeMessage(3, 0.3)};
  nameEvents(life_, {volumeEvent(11, "0.1"), volumeEvent(12, "0.2"), volumeEvent(14, "0.3")}, json_);
  EXPECT_THAT(eventsOf(life_), ElementsAre(11, 12, 14));
  ASSERT_NE(life_.messageOf(12), nullptr);
  EXPECT_EQ(life_.messageOf(12)->integer("number"), 2);
  EXPECT_EQ(life_.messageOf(13), nullptr);
}

TEST_F(SessionReasonsTest, LeavesRedundantMessagesWithoutAnEvent) {
  life_.messages = {volumeMessage(1, 0.1), volumeMessage(2, 0.1), volumeMessage(3, 0.3)};
  life_.messages[1].set("redundant", true);
  nameEvents(life_, {volumeEvent(11, "0.1"), volumeEvent(12, "0.3")}, json_);
  EXPECT_THAT(eventsOf(life_), ElementsAre(11, 0, 12));
}

TEST_F(SessionReasonsTest, ComparesWhatMessagesSayWhenTheStoreDoesNotHaveAll) {
  life_.messages = {volumeMessage(1, 0.1), volumeMessage(2, 0.2), volumeMessage(3, 0.3)};
  nameEvents(life_, {volumeEvent(12, "0.2"), volumeEvent(14, "0.3")}, json_);
  EXPECT_THAT(eventsOf(life_), ElementsAre(0, 12, 14));
  life_.messages = {volumeMessage(1, 0.1), volumeMessage(2, 0.2), volumeMessage(3, 0.3)};
  nameEvents(life_, {volumeEvent(11, "0.1"), volumeEvent(12, "0.2")}, json_);
  EXPECT_THAT(eventsOf(life_), ElementsAre(11, 12, 0));
}

// One event that fits nothing must not take the events after it with it.
TEST_F(SessionReasonsTest, PassesOverAnEventThatFitsNoMessage) {
  life_.messages = {volumeMessage(1, 0.1), volumeMessage(2, 0.2), volumeMessage(3, 0.3)};
  nameEvents(life_, {volumeEvent(10, "0.9"), volumeEvent(12, "0.2")}, json_);
  EXPECT_THAT(eventsOf(life_), ElementsAre(0, 12, 0));
}

TEST_F(SessionReasonsTest, TellsTheValuesOfTheDeviceThatWereRecorded) {
  life_.messages = {sessionSummary(0.0)};
  nameEvents(life_, {{20, "Session_Generic", "Summary", "derived", 20.0, R"({"load_avg_1_min":1.5})"}},
             json_);
  EXPECT_EQ(life_.messages.front().integer(kMessageKeyEvent), 20);
  EXPECT_EQ(life_.messages.front().find("payload")->asMap()->number("load_avg_1_min"), 1.5);
  EXPECT_THAT(life_.onlyStored, IsEmpty());
}

TEST_F(SessionReasonsTest, TellsNoValuesOfTheDeviceThatTheStoreDoesNotHave) {
  life_.messages = {sessionSummary(0.0)};
  nameEvents(life_, {}, json_);
  EXPECT_FALSE(life_.messages.front().contains("payload"));
}

TEST_F(SessionReasonsTest, KeepsWhatOnlyTheDaemonMade) {
  nameEvents(life_, {{20, "Setup", "Setup", "derived", 20.0, R"({"ringerstate":true})"}}, json_);
  ASSERT_THAT(life_.onlyStored, SizeIs(1));
  EXPECT_EQ(life_.onlyStored.front().event, 20);
}

TEST_F(SessionReasonsTest, FindsTheLifeThatBeganNearest) {
  std::vector<ReasonedLife> lives(2);
  for (ReasonedLife& life : lives) life.reporterID = 7;
  lives[0].startedAt = 10.0;
  lives[1].startedAt = 10.0006;
  StoredSession session;
  session.reporterID = 7;
  session.startedAt = 10.0007;
  EXPECT_EQ(lifeOf(lives, session), &lives[1]);
  session.startedAt = 10.0001;
  EXPECT_EQ(lifeOf(lives, session), &lives[0]);
  session.startedAt = 10.1;
  EXPECT_EQ(lifeOf(lives, session), nullptr);
}

}  // namespace
}  // namespace tonewerk
