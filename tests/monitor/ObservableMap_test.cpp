// SPDX-License-Identifier: Apache-2.0
#include "monitor/ObservableMap.h"

#include <gmock/gmock.h>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class ObservableMapTest : public ::testing::Test {
 protected:
  using Observation = ObservableMap::Observation;

  // Makes an observer that records its name, the key and the value in the map.
  ObservableMap::Observer recorder(const std::string& name) {
    return [this, name](std::string_view key) {
      notified.push_back(name + " " + std::string(key) + map->find(key)->text());
    };
  }
  Observation observe(std::string_view key, ObservableMap::Observer observer) {
    return ObservableMap::observe(map, key, std::move(observer));
  }

  std::shared_ptr<ObservableMap> map = std::make_shared<ObservableMap>();
  std::vector<std::string> notified;
};

TEST_F(ObservableMapTest, FindsTheValueThatWasSetLast) {
  EXPECT_EQ(map->find("a"), std::nullopt);
  map->set("a", {{"n", 1}});
  map->set("a", {{"n", 2}});
  EXPECT_EQ(map->find("a"), (ValueMap{{"n", 2}}));
  EXPECT_EQ(map->find("b"), std::nullopt);
}

TEST_F(ObservableMapTest, NotifiesTheObserversOfAKeyInOrderBeforeSetReturns) {
  const auto first = observe("a", recorder("first"));
  const auto other = observe("b", recorder("other"));
  const auto second = observe("a", recorder("second"));
  map->set("a", {{"n", 1}});
  EXPECT_THAT(notified, ElementsAre(R"(first a{"n":1})", R"(second a{"n":1})"));
}

TEST_F(ObservableMapTest, AnObserverMayObserveSeveralKeys) {
  const auto observer = std::make_shared<const ObservableMap::Observer>(recorder("it"));
  auto first = ObservableMap::observe(map, "a", observer);
  const auto second = ObservableMap::observe(map, "b", observer);
  map->set("a", {{"n", 1}});
  map->set("b", {{"n", 2}});
  first = {};
  map->set("a", {{"n", 3}});
  map->set("b", {{"n", 4}});
  EXPECT_THAT(notified, ElementsAre(R"(it a{"n":1})", R"(it b{"n":2})", R"(it b{"n":4})"));
}

TEST_F(ObservableMapTest, SettingAnEqualValueNotifiesToo) {
  const auto observation = observe("a", recorder("it"));
  map->set("a", {{"n", 1}});
  map->set("a", {{"n", 1}});
  EXPECT_EQ(notified.size(), 2U);
}

TEST_F(ObservableMapTest, AnObserverIsNotNotifiedAfterItsObservationHasEnded) {
  auto observation = observe("a", recorder("it"));
  observation = {};
  map->set("a", {});
  EXPECT_THAT(notified, IsEmpty());
  EXPECT_EQ(map->observerCount(), 0U);
}

TEST_F(ObservableMapTest, AMovedObservationStaysInEffect) {
  auto observation = observe("a", recorder("it"));
  Observation moved(std::move(observation));
  Observation again;
  again = std::move(moved);
  map->set("a", {});
  EXPECT_EQ(notified.size(), 1U);
  EXPECT_EQ(map->observerCount(), 1U);
}

TEST_F(ObservableMapTest, AnObservationKeepsTheMapAlive) {
  const std::weak_ptr<ObservableMap> weak = map;
  auto observation = observe("a", [](std::string_view) {});
  map.reset();
  EXPECT_FALSE(weak.expired());
  observation = {};
  EXPECT_TRUE(weak.expired());
}

TEST_F(ObservableMapTest, AnObserverMayEndItsOwnObservation) {
  Observation observation;
  const std::string captured = "alive";
  observation = observe("a", [&, captured](std::string_view) {
    observation = {};
    notified.push_back(captured);  // the observer outlives the call
  });
  const auto other = observe("a", recorder("other"));
  map->set("a", {});
  map->set("a", {});
  EXPECT_THAT(notified, ElementsAre("alive", "other a{}", "other a{}"));
}

TEST_F(ObservableMapTest, AnObserverMayEndOthersBeforeAndAfterIt) {
  Observation before;
  Observation behind;
  before = observe("a", recorder("before"));
  const auto middle = observe("a", [&](std::string_view) {
    before = {};
    behind = {};
  });
  behind = observe("a", recorder("behind"));
  const auto last = observe("a", recorder("last"));
  map->set("a", {});
  EXPECT_THAT(notified, ElementsAre("before a{}", "last a{}"));
  map->set("a", {});
  EXPECT_THAT(notified, ElementsAre("before a{}", "last a{}", "last a{}"));
}

TEST_F(ObservableMapTest, AnObserverAddedDuringASetIsNotNotifiedOfThatSet) {
  Observation late;
  const auto observation = observe("a", [&](std::string_view) { late = observe("a", recorder("late")); });
  map->set("a", {});
  EXPECT_THAT(notified, IsEmpty());
  map->set("b", {});
  EXPECT_EQ(map->observerCount(), 2U);
}

TEST_F(ObservableMapTest, AnObserverMaySetTheMap) {
  const auto other = observe("b", recorder("b's"));
  const auto first = observe("a", [&](std::string_view) {
    if (map->find("a") == ValueMap{{"n", 1}}) map->set("a", {{"n", 2}});
    map->set("b", {});
  });
  const auto second = observe("a", recorder("second"));
  map->set("a", {{"n", 1}});
  // The inner set notifies all observers. The outer set then continues with the current value.
  EXPECT_THAT(notified, ElementsAre("b's b{}", R"(second a{"n":2})", "b's b{}", R"(second a{"n":2})"));
}

TEST_F(ObservableMapTest, EndingAnObservationWaitsForItsObserverOnAnotherThread) {
  std::atomic<bool> isRunning = false;
  std::atomic<bool> mayEnd = false;
  bool hasEnded = false;  // need not be atomic, because the wait orders the accesses
  auto observation = observe("a", [&](std::string_view) {
    isRunning = true;
    isRunning.notify_all();
    mayEnd.wait(false);
    hasEnded = true;
  });
  std::thread setter([&] { map->set("a", {}); });
  isRunning.wait(false);
  std::thread releaser([&] {
    mayEnd = true;
    mayEnd.notify_all();
  });
  observation = {};
  EXPECT_TRUE(hasEnded);
  setter.join();
  releaser.join();
}

TEST_F(ObservableMapTest, ReadingAndSettingUnderTheLockIsOneStep) {
  constexpr int kEach = 2000;
  const auto count = [&] {
    for (int at = 0; at < kEach; ++at) {
      const RecursiveMutexLock lock(map->mutex());
      const auto held = map->find("a");
      map->set("a", {{"n", held ? held->integer("n") + 1 : 1}});
    }
  };
  std::thread one(count);
  std::thread other(count);
  one.join();
  other.join();
  EXPECT_EQ(map->find("a")->integer("n"), 2 * kEach);
}

}  // namespace
}  // namespace tonewerk
