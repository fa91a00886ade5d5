// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RecentMaps.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <string>

#include "platform/linux/messagepack/RpcWriter.h"
#include "values/ShapeTable.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kKind = 7;

class RecentMapsTest : public testing::Test {
 protected:
  // Offers {key: text}.
  void offer(std::uint64_t kind, ShapeTable& table, const std::string& key,
             const std::string& text = "text") {
    std::string bytes;
    RpcWriter(bytes).value(ValueMap{{key, text}});
    std::string value;
    RpcWriter(value).value(text);
    const Shape& shape = *table.shapeAt(table.next(ShapeTable::root(), key));
    maps.offer(kind, table, bytes, shape, value);
  }

  ShapeTable shapes;
  RecentMaps maps;
};

TEST_F(RecentMapsTest, RemembersTheSecondMapOfAShape) {
  offer(kKind, shapes, "a", "first");
  EXPECT_EQ(maps.find(kKind, shapes), nullptr);
  offer(kKind, shapes, "a", "second");
  const RecentMaps::Map* map = maps.find(kKind, shapes);
  ASSERT_NE(map, nullptr);
  EXPECT_EQ(map->bytes,
            "\x81\xA1"
            "a\xA6second");
  EXPECT_EQ(map->values, "\xA6second");
  ASSERT_EQ(map->entries.size(), 1U);
  EXPECT_EQ(map->entries[0].value, 3U);
  EXPECT_EQ(map->entries[0].end, 10U);
  EXPECT_EQ(map->entries[0].packedEnd, 7U);
}

TEST_F(RecentMapsTest, RemembersNothingOfMapsThatAreNeverAlike) {
  for (int round = 0; round < 10; ++round) {
    offer(kKind, shapes, "a");
    offer(kKind, shapes, "b");
  }
  EXPECT_EQ(maps.find(kKind, shapes), nullptr);
}

TEST_F(RecentMapsTest, TellsKindsAndTablesApart) {
  ShapeTable others;
  for (int round = 0; round < 2; ++round) {
    offer(kKind, shapes, "a");
    offer(kKind, others, "b");
  }
  EXPECT_EQ(maps.find(kKind + 1, shapes), nullptr);
  ASSERT_NE(maps.find(kKind, shapes), nullptr);
  EXPECT_TRUE(shapes.owns(*maps.find(kKind, shapes)->shape));
  EXPECT_TRUE(others.owns(*maps.find(kKind, others)->shape));
}

TEST_F(RecentMapsTest, DoesNotRememberAMapThatIsTooLong) {
  const std::string longest(RecentMaps::kMaxMapBytes - 6, 'x');  // and the headers of map, key and text
  for (int round = 0; round < 2; ++round) offer(kKind, shapes, "a", longest);
  EXPECT_NE(maps.find(kKind, shapes), nullptr);
  for (int round = 0; round < 2; ++round) offer(kKind + 1, shapes, "a", longest + "x");
  EXPECT_EQ(maps.find(kKind + 1, shapes), nullptr);
}

TEST_F(RecentMapsTest, KeepsNoMoreBytesThanItsLimit) {
  const std::string text(RecentMaps::kMaxMapBytes - 100, 'x');
  std::size_t most = 0;
  for (std::uint64_t kind = 0; kind < 100; ++kind) {
    for (int round = 0; round < 2; ++round) offer(kind, shapes, "a", text);
    std::size_t bytes = 0;
    for (std::uint64_t each = 0; each <= kind; ++each) {
      const RecentMaps::Map* map = maps.find(each, shapes);
      if (map != nullptr) bytes += map->bytes.size() + map->values.size();
    }
    most = std::max(most, bytes);
  }
  EXPECT_LE(most, RecentMaps::kMaxBytes);
  EXPECT_GT(most, RecentMaps::kMaxBytes / 2);
}

}  // namespace
}  // namespace tonewerk
