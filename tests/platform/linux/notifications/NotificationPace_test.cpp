// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/NotificationPace.h"

#include <atomic>
#include <chrono>
#include <gmock/gmock.h>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "platform/linux/threads/TimerThread.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualTimers.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using namespace std::chrono_literals;

class NotificationPaceTest : public ::testing::Test {
 protected:
  NotificationPaceTest() { pace->add("a"); }

  // What was told since the last call, with the milliseconds since the beginning.
  std::vector<std::pair<std::string, int>> told() { return std::exchange(told_, {}); }

  ManualClock clock;
  ManualTimers timers{clock};
  const std::chrono::nanoseconds begin = clock.monotonic();
  std::vector<std::pair<std::string, int>> told_;
  std::optional<NotificationPace> pace{std::in_place, timers, [this](std::string_view name) {
                                         told_.emplace_back(name, (clock.monotonic() - begin) / 1ms);
                                       }};
};

TEST_F(NotificationPaceTest, ANameThatWasQuietIsToldAtOnce) {
  pace->post("a");
  EXPECT_THAT(told(), ElementsAre(Pair("a", 0)));
  clock.advance(100ms);
  pace->post("a");
  EXPECT_THAT(told(), ElementsAre(Pair("a", 100)));
}

TEST_F(NotificationPaceTest, PostsWithinAnIntervalAreToldTogetherAtItsEnd) {
  pace->post("a");
  for (int post = 0; post < 5; ++post, clock.advance(10ms)) pace->post("a");
  told();
  clock.advance(49ms);
  EXPECT_THAT(told(), IsEmpty());
  clock.advance(1ms);
  EXPECT_THAT(told(), ElementsAre(Pair("a", 100)));
  clock.advance(10s);
  EXPECT_THAT(told(), IsEmpty());
}

TEST_F(NotificationPaceTest, ANameThatIsPostedAllTheTimeIsToldOnceAnInterval) {
  for (int millisecond = 0; millisecond < 5000; ++millisecond, clock.advance(1ms)) {
    for (int post = 0; post < 20; ++post) pace->post("a");
  }
  clock.advance(1s);
  const auto times = told();
  EXPECT_EQ(times.size(), 51U);
  EXPECT_EQ(times.back().second, 5000);  // after the last post
}

TEST_F(NotificationPaceTest, APostJustAfterAnIntervalWaitsForTheNext) {
  pace->post("a");
  clock.advance(50ms);
  pace->post("a");
  clock.advance(60ms);
  pace->post("a");
  clock.advance(1s);
  EXPECT_THAT(told(), ElementsAre(Pair("a", 0), Pair("a", 100), Pair("a", 200)));
}

TEST_F(NotificationPaceTest, NamesDoNotWaitForEachOther) {
  pace->add("b");
  pace->post("a");
  clock.advance(30ms);
  pace->post("b");
  EXPECT_THAT(told(), ElementsAre(Pair("a", 0), Pair("b", 30)));
  pace->postAll();
  clock.advance(1s);
  EXPECT_THAT(told(), ElementsAre(Pair("a", 100), Pair("b", 130)));
}

TEST_F(NotificationPaceTest, NamesThatNobodyHasAddedCostNothing) {
  for (int name = 0; name < 1000; ++name) pace->post("other-" + std::to_string(name));
  EXPECT_THAT(told(), IsEmpty());
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(NotificationPaceTest, AQuietNameHasNoTimer) {
  pace->post("a");
  EXPECT_EQ(timers.count(), 1U);
  clock.advance(100ms);
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(NotificationPaceTest, ANameIsToldUntilItIsRemovedAsOftenAsItWasAdded) {
  pace->add("a");
  pace->remove("a");
  pace->post("a");
  EXPECT_THAT(told(), ElementsAre(Pair("a", 0)));
  pace->post("a");
  pace->remove("a");
  pace->remove("a");
  clock.advance(1s);
  pace->post("a");
  EXPECT_THAT(told(), IsEmpty());
  EXPECT_EQ(timers.count(), 0U);
}

TEST_F(NotificationPaceTest, NothingIsToldAfterTheEnd) {
  pace->post("a");
  pace->post("a");
  told();
  pace.reset();
  clock.advance(1s);
  EXPECT_THAT(told(), IsEmpty());
  EXPECT_EQ(timers.count(), 0U);
}

// The thread sanitizer has something to find here.
TEST(NotificationPaceThreadsTest, MayEndWhileItTells) {
  TimerThread timers;
  for (int round = 0; round < 3; ++round) {
    std::atomic<int> count = 0;
    NotificationPace pace(timers, [&](std::string_view) { ++count; });
    pace.add("a");
    std::jthread poster([&](const std::stop_token& stop) {
      while (!stop.stop_requested()) pace.post("a");
    });
    const auto end = std::chrono::steady_clock::now() + NotificationPace::kInterval;
    while (std::chrono::steady_clock::now() < end) std::this_thread::yield();
    poster.request_stop();
    poster.join();
    EXPECT_GE(count.load(), 1);
  }
}

}  // namespace
}  // namespace tonewerk
