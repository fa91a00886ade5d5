// SPDX-License-Identifier: Apache-2.0
#include "session/SingletonRegistry.h"

#include <gmock/gmock.h>
#include <string>
#include <thread>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;

std::vector<std::string> ends;

struct First {
  explicit First(int number) : value(number) {}
  ~First() { ends.emplace_back("first"); }
  int value;
};

struct Second {
  explicit Second(SingletonRegistry& singletons) : value(singletons.get<First>(5).value + 1) {}
  ~Second() { ends.emplace_back("second"); }
  int value;
};

TEST(SingletonRegistryTest, MakesEachObjectOnce) {
  SingletonRegistry singletons;
  First& first = singletons.get<First>(1);
  EXPECT_EQ(&singletons.get<First>(2), &first);
  EXPECT_EQ(first.value, 1);
}

TEST(SingletonRegistryTest, FindsNothingBeforeTheFirstGet) {
  SingletonRegistry singletons;
  EXPECT_EQ(singletons.find<First>(), nullptr);
  First& first = singletons.get<First>(1);
  EXPECT_EQ(singletons.find<First>(), &first);
}

TEST(SingletonRegistryTest, AnObjectMayUseAnotherAndEndsBeforeIt) {
  ends.clear();
  {
    SingletonRegistry singletons;
    EXPECT_EQ(singletons.get<Second>(singletons).value, 6);
  }
  EXPECT_THAT(ends, ElementsAre("second", "first"));
}

TEST(SingletonRegistryTest, ThreadsThatGetAtOnceShareOneObject) {
  SingletonRegistry singletons;
  First* seen[2] = {};
  std::thread one([&] { seen[0] = &singletons.get<First>(1); });
  std::thread other([&] { seen[1] = &singletons.get<First>(2); });
  one.join();
  other.join();
  EXPECT_EQ(seen[0], seen[1]);
}

}  // namespace
}  // namespace tonewerk
