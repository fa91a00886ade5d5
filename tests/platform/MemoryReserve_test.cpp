// SPDX-License-Identifier: Apache-2.0
#include "platform/MemoryReserve.h"

#include <gtest/gtest.h>
#include <new>

namespace tonewerk {
namespace {

// Leaves no reserve and no handler behind.
class MemoryReserveTest : public testing::Test {
 protected:
  ~MemoryReserveTest() override {
    static_cast<void>(MemoryReserve::putAside());
    static_cast<void>(MemoryReserve::use());
    std::set_new_handler(nullptr);
  }
};

TEST_F(MemoryReserveTest, MemoryIsShortWhenTheReserveIsInUse) {
  ASSERT_TRUE(MemoryReserve::putAside());
  EXPECT_FALSE(MemoryReserve::isShort());
  EXPECT_EQ(MemoryReserve::unusedBytes(), MemoryReserve::kBytes);
  EXPECT_TRUE(MemoryReserve::use());
  EXPECT_TRUE(MemoryReserve::isShort());
  EXPECT_EQ(MemoryReserve::unusedBytes(), 0U);
}

TEST_F(MemoryReserveTest, AFailedAllocationUsesTheReserveOnce) {
  ASSERT_TRUE(MemoryReserve::putAside());
  const std::new_handler handler = std::get_new_handler();
  ASSERT_NE(handler, nullptr);
  handler();  // returns, so the allocation is tried again
  EXPECT_TRUE(MemoryReserve::isShort());
  EXPECT_THROW(handler(), std::bad_alloc);
}

TEST_F(MemoryReserveTest, RecoversWhenThereIsMemoryAgain) {
  ASSERT_TRUE(MemoryReserve::putAside());
  EXPECT_TRUE(MemoryReserve::use());
  EXPECT_TRUE(MemoryReserve::tryToRecover());
  EXPECT_FALSE(MemoryReserve::isShort());
  EXPECT_TRUE(MemoryReserve::use());
}

}  // namespace
}  // namespace tonewerk
