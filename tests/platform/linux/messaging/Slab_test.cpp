// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/Slab.h"

#include <algorithm>
#include <gmock/gmock.h>
#include <string>
#include <thread>
#include <vector>

namespace tonewerk {
namespace {

class SlabPoolTest : public testing::Test {
 protected:
  // Writes `text` as a read would.
  SlabBytes put(std::string_view text) {
    const std::span<char> room = pool.room();
    std::copy(text.begin(), text.end(), room.begin());
    return pool.commit(text.size());
  }
  // Uses up the current slab.
  SlabBytes fill() { return pool.commit(pool.room().size()); }

  SlabPool pool;
};

TEST_F(SlabPoolTest, ReadsShareASlabAndKeepTheirBytes) {
  const SlabBytes first = put("first");
  const SlabBytes second = put("second");
  EXPECT_EQ(first.slab, second.slab);
  EXPECT_EQ(first.bytes, "first");
  EXPECT_EQ(second.bytes, "second");
}

TEST_F(SlabPoolTest, BytesThatWereReadButNotCommittedAreOverwritten) {
  pool.room()[0] = 'x';
  EXPECT_EQ(put("y").bytes, "y");
}

TEST_F(SlabPoolTest, ASlabWithLittleRoomIsNotReadInto) {
  const SlabBytes most = pool.commit(pool.room().size() - SlabPool::kMinRoomBytes + 1);
  EXPECT_EQ(pool.room().size(), Slab().size());
  EXPECT_NE(put("x").slab, most.slab);
}

TEST_F(SlabPoolTest, ASlabWithJustEnoughRoomIsReadInto) {
  const SlabBytes most = pool.commit(pool.room().size() - SlabPool::kMinRoomBytes);
  EXPECT_EQ(pool.room().size(), SlabPool::kMinRoomBytes);
  EXPECT_EQ(put("x").slab, most.slab);
}

TEST_F(SlabPoolTest, AFullSlabIsUsedAgainOnceNobodyRefersToIt) {
  const Slab* first = fill().slab.get();  // nothing refers to its bytes
  EXPECT_EQ(put("x").slab.get(), first);
}

TEST_F(SlabPoolTest, ASlabIsNotUsedAgainWhileSomebodyRefersToIt) {
  SlabBytes held = fill();
  const SlabBytes next = put("x");
  EXPECT_NE(next.slab, held.slab);
  const Slab* first = held.slab.get();
  held = {};
  fill();
  EXPECT_EQ(put("y").slab.get(), first);
}

TEST_F(SlabPoolTest, BytesOutliveThePool) {
  auto ending = std::make_unique<SlabPool>();
  std::copy_n("text", 4, ending->room().begin());
  const SlabBytes bytes = ending->commit(4);
  ending = nullptr;
  EXPECT_EQ(bytes.bytes, "text");
}

TEST_F(SlabPoolTest, AnotherThreadMayDestroyTheBytes) {
  for (int round = 0; round < 100; ++round) {
    SlabBytes bytes = put("text");
    SlabBytes rest = fill();
    std::thread other([first = std::move(bytes), second = std::move(rest)]() mutable {
      EXPECT_EQ(first.bytes, "text");
      first = {};
      second = {};
    });
    put("meanwhile");
    other.join();
  }
}

}  // namespace
}  // namespace tonewerk
