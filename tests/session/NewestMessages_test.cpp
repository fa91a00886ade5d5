// SPDX-License-Identifier: Apache-2.0
#include "session/NewestMessages.h"

#include <gtest/gtest.h>
#include <vector>

#include "session/TWReportingSessionMessage.h"

namespace tonewerk {
namespace {

TEST(NewestMessagesTest, FindsTheNewestOfEachKindHoweverManyKindsThereAre) {
  constexpr AudioEventCategory kKinds = 3 * NewestMessages::kFew;
  const std::vector<TWReportingSessionMessage> messages(std::size_t{2} * kKinds,
                                                        {{}, kCategoryGeneric, kTypeStart});
  NewestMessages newest;
  for (AudioEventCategory kind = 0; kind < kKinds; ++kind) {
    EXPECT_EQ(newest.find({kind, kTypeStart}), nullptr);
    newest.set({kind, kTypeStart}, &messages[kind]);
  }
  for (AudioEventCategory kind = 0; kind < kKinds; kind += 2) {
    newest.set({kind, kTypeStart}, &messages[kKinds + kind]);
  }
  newest.prefetchKinds();
  for (AudioEventCategory kind = 0; kind < kKinds; ++kind) {
    EXPECT_EQ(newest.find({kind, kTypeStart}), &messages[kind % 2 == 0 ? kKinds + kind : kind]);
    EXPECT_EQ(newest.find({kind, kTypeStop}), nullptr);
  }
}

TEST(NewestMessagesTest, HasNoneAfterClear) {
  const TWReportingSessionMessage message({}, kCategoryGeneric, kTypeStart);
  NewestMessages newest;
  for (AudioEventCategory kind = 0; kind <= NewestMessages::kFew; ++kind)
    newest.set({kind, kTypeStart}, &message);
  newest.clear();
  for (AudioEventCategory kind = 0; kind <= NewestMessages::kFew; ++kind)
    EXPECT_EQ(newest.find({kind, kTypeStart}), nullptr);
}

}  // namespace
}  // namespace tonewerk
