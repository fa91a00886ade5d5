// SPDX-License-Identifier: Apache-2.0
#include "session/KeptPayloads.h"

#include <cstddef>
#include <cstdint>
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <set>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "support/PackedMaps.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

class KeptPayloadsTest : public ::testing::Test {
 protected:
  ValueMap payload(int number, std::size_t textBytes = 40) {
    return packedMapOf({{"n", number}, {"text", std::string(textBytes, 'x')}}, shapes);
  }

  ShapeTable shapes;
  KeptPayloads payloads;
};

TEST_F(KeptPayloadsTest, CopiesAPackedMap) {
  const ValueMap map = payload(1);
  const ValueMap kept = payloads.keep(map);
  EXPECT_EQ(kept, map);
  EXPECT_FALSE(kept.sharesStorageWith(map));
  EXPECT_EQ(kept.shape(), map.shape());
}

TEST_F(KeptPayloadsTest, LeavesATreeAndALargeMapWhereTheyAre) {
  const ValueMap tree{{"a", 1}};
  EXPECT_TRUE(payloads.keep(tree).sharesStorageWith(tree));
  const ValueMap large = payload(1, KeptPayloads::kMaxMapBytes);
  EXPECT_TRUE(payloads.keep(large).sharesStorageWith(large));
  EXPECT_TRUE(payloads.keep({}).empty());
}

TEST_F(KeptPayloadsTest, PutsOneMapBehindTheOther) {
  const ValueMap first = payloads.keep(payload(1));
  const ValueMap second = payloads.keep(payload(2));
  const auto distance =
      reinterpret_cast<const char*>(second.packed()) - reinterpret_cast<const char*>(first.packed());
  EXPECT_GE(distance, static_cast<std::ptrdiff_t>(first.bytes()));
  EXPECT_LT(distance, static_cast<std::ptrdiff_t>(first.bytes() + alignof(PackedMap)));
}

TEST_F(KeptPayloadsTest, CountsEveryRegionWhenItIsOpened) {
  for (const std::size_t text : {std::size_t{40}, std::size_t{500}, KeptPayloads::kMaxMapBytes - 20}) {
    KeptPayloads own;
    std::vector<ValueMap> kept;
    std::set<std::uintptr_t> chunks;
    std::size_t counted = 0;
    for (int number = 0; number < 5'000; ++number) {
      const ValueMap map = payload(100 + number % 20, text);
      const std::size_t taken = own.bytesFor(map);
      EXPECT_LE(taken, KeptPayloads::kMaxRegionBytes);
      counted += taken;
      kept.push_back(own.keep(map));
      EXPECT_FALSE(kept.back().sharesStorageWith(map));
      chunks.insert(reinterpret_cast<std::uintptr_t>(kept.back().packed()) / PackedChunk::kBytes);
      ASSERT_GE(counted, chunks.size() * PackedChunk::kBytes) << text;
    }
    EXPECT_LE(counted, chunks.size() * PackedChunk::kBytes + KeptPayloads::kMaxRegionBytes) << text;
  }
}

TEST_F(KeptPayloadsTest, CountsAPayloadThatStaysWhereItIs) {
  const ValueMap tree{{"a", 1}};
  EXPECT_GT(payloads.bytesFor(tree), tree.bytes());
  const ValueMap large = payload(1, KeptPayloads::kMaxMapBytes);
  EXPECT_GT(payloads.bytesFor(large), large.bytes());
}

TEST_F(KeptPayloadsTest, AMapOutlivesItsMaker) {
  ValueMap kept;
  {
    KeptPayloads others;
    kept = others.keep(payload(7));
    for (int number = 0; number < 1'000; ++number) (void)others.keep(payload(number, 500));
  }
  EXPECT_EQ(kept.integer("n"), 7);
  EXPECT_EQ(kept.text("text"), std::string(40, 'x'));
}

TEST_F(KeptPayloadsTest, GoesOnAfterItWasCleared) {
  const ValueMap before = payloads.keep(payload(1));
  payloads.clear();
  const ValueMap after = payloads.keep(payload(2));
  EXPECT_EQ(before.integer("n"), 1);
  EXPECT_EQ(after.integer("n"), 2);
}

TEST_F(KeptPayloadsTest, MapsEndOnAnyThread) {
  std::vector<ValueMap> all;
  all.reserve(20'000);
  for (int number = 0; number < 20'000; ++number) all.push_back(payloads.keep(payload(number)));
  std::vector<ValueMap> copies(all.begin(), all.end());
  std::thread other([taken = std::move(copies)]() mutable { taken.clear(); });
  all.clear();
  payloads.clear();
  other.join();
}

RC_GTEST_FIXTURE_PROP(KeptPayloadsTest, KeepsWhatItWasGiven, ()) {
  const auto sizes = *rc::gen::container<std::vector<std::size_t>>(rc::gen::inRange<std::size_t>(0, 1'500));
  std::vector<ValueMap> given;
  std::vector<ValueMap> kept;
  for (const std::size_t size : sizes) {
    given.push_back(payload(static_cast<int>(given.size()), size));
    kept.push_back(payloads.keep(given.back()));
    if (size % 10 == 0) payloads.clear();
    if (size % 10 == 1) kept[size % kept.size()] = given[size % kept.size()];
  }
  RC_ASSERT(kept == given);
}

}  // namespace
}  // namespace tonewerk
