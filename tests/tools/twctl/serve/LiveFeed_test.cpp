// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/LiveFeed.h"

#include <gmock/gmock.h>
#include <optional>
#include <thread>

namespace tonewerk {
namespace {

constexpr std::chrono::minutes kPatience{2};
constexpr std::chrono::milliseconds kNone{0};

TEST(LiveFeedTest, GivesASlowReaderTheNewestStateOnly) {
  LiveFeed feed;
  std::uint64_t number = 0;
  EXPECT_EQ(feed.newerThan(number, kNone), nullptr);
  for (const char* state : {"one", "two", "three"}) feed.publish(state);
  EXPECT_EQ(*feed.newerThan(number, kPatience), "three");
  EXPECT_EQ(feed.newerThan(number, kNone), nullptr);
}

TEST(LiveFeedTest, WakesAReaderThatWaits) {
  LiveFeed feed;
  std::thread writer([&] { feed.publish("news"); });
  std::uint64_t number = 0;
  EXPECT_EQ(*feed.newerThan(number, kPatience), "news");
  writer.join();
}

TEST(LiveFeedTest, LetsNobodyWaitAfterItsEnd) {
  LiveFeed feed;
  feed.publish("news");
  std::thread ender([&] { feed.end(); });
  std::uint64_t number = 1;
  EXPECT_EQ(feed.newerThan(number, kPatience), nullptr);
  ender.join();
  EXPECT_TRUE(feed.hasEnded());
}

TEST(LiveFeedTest, CountsItsReaders) {
  LiveFeed feed;
  {
    const LiveFeed::Reader one(feed);
    const LiveFeed::Reader two(feed);
    EXPECT_EQ(feed.readers(), 2U);
  }
  EXPECT_EQ(feed.readers(), 0U);
}

}  // namespace
}  // namespace tonewerk
