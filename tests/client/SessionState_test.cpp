// SPDX-License-Identifier: Apache-2.0
#include "client/SessionState.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Kind = SessionChange::Kind;

std::vector<Kind> kindsBetween(const SessionState& from, const SessionState& to) {
  std::vector<Kind> kinds;
  for (const SessionChange& change : changesBetween(from, to)) kinds.push_back(change.kind);
  return kinds;
}

TEST(SessionStateTest, IsStoppedByAnotherType) {
  SessionState state{true, 7, {}, true};
  state.apply({Kind::kServiceType, 7, {}});
  EXPECT_TRUE(state.isStarted);
  state.apply({Kind::kServiceType, 8, {}});
  EXPECT_FALSE(state.isStarted);
}

TEST(SessionStateTest, IsResetWhenItIsCreated) {
  SessionState state{true, 7, {{"a", 1}}, true};
  state.apply({Kind::kCreate, 0, {}});
  EXPECT_TRUE(state.exists);
  EXPECT_EQ(state.serviceType, TWR_SERVICE_UNKNOWN);
  EXPECT_TRUE(state.configuration.empty());
  EXPECT_FALSE(state.isStarted);
}

TEST(SessionStateTest, MergesConfigurations) {
  SessionState state{true, 7, {{"a", 1}, {"b", 1}}, true};
  state.apply({Kind::kConfiguration, 0, {{"b", 2}}});
  EXPECT_EQ(state.configuration, (ValueMap{{"a", 1}, {"b", 2}}));
}

TEST(SessionStateTest, TakesTheApplicationsOtherNameAsTheDaemonDoes) {
  SessionState state{true, 7, {{"HostApplicationDisplayID", "a"}}, true};
  state.apply({Kind::kConfiguration, 0, {{"QMHostApplicationDisplayID", "b"}}});
  EXPECT_EQ(state.configuration.text("HostApplicationDisplayID"), "b");
  state.apply({Kind::kConfiguration, 0, {{"HostApplicationDisplayID", "c"}}});
  EXPECT_EQ(state.configuration.text("HostApplicationDisplayID"), "c");
  state.apply(
      {Kind::kConfiguration, 0, {{"QMHostApplicationDisplayID", "d"}, {"HostApplicationDisplayID", "e"}}});
  EXPECT_EQ(state.configuration.text("HostApplicationDisplayID"), "e");
}

TEST(SessionStateTest, NeedsNothingToBecomeWhatItIs) {
  const SessionState state{true, 7, {{"a", 1}}, true};
  EXPECT_THAT(changesBetween(state, state), IsEmpty());
  EXPECT_THAT(changesBetween({}, {}), IsEmpty());
}

TEST(SessionStateTest, IsMadeFromNothingInTheProtocolsOrder) {
  EXPECT_THAT(kindsBetween({}, {true, 7, {{"a", 1}}, true}),
              ElementsAre(Kind::kCreate, Kind::kServiceType, Kind::kConfiguration, Kind::kStart));
  EXPECT_THAT(kindsBetween({}, {true, TWR_SERVICE_UNKNOWN, {}, false}), ElementsAre(Kind::kCreate));
}

TEST(SessionStateTest, IsStartedAgainAfterAnotherType) {
  EXPECT_THAT(kindsBetween({true, 1, {}, true}, {true, 2, {}, true}),
              ElementsAre(Kind::kServiceType, Kind::kStart));
  EXPECT_THAT(kindsBetween({true, 1, {}, true}, {true, 2, {}, false}), ElementsAre(Kind::kServiceType));
}

TEST(SessionStateTest, IsStoppedAndDestroyed) {
  EXPECT_THAT(kindsBetween({true, 1, {}, true}, {true, 1, {}, false}), ElementsAre(Kind::kStop));
  EXPECT_THAT(kindsBetween({true, 1, {}, true}, {}), ElementsAre(Kind::kDestroy));
}

}  // namespace
}  // namespace tonewerk
