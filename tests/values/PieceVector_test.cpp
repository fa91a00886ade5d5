// SPDX-License-Identifier: Apache-2.0
#include "values/PieceVector.h"

#include <cstddef>
#include <gtest/gtest.h>
#include <memory>
#include <utility>
#include <vector>

namespace tonewerk {
namespace {

TEST(PieceVectorTest, HoldsWhatAVectorHoldsAtEachLength) {
  PieceVector<std::size_t> pieces;
  std::vector<std::size_t> plain;
  for (std::size_t length = 0; length < 300; ++length) {
    ASSERT_EQ(pieces.size(), plain.size());
    for (std::size_t place = 0; place < length; ++place) ASSERT_EQ(pieces[place], plain[place]) << length;
    pieces.add(length * 7);
    plain.push_back(length * 7);
  }
}

TEST(PieceVectorTest, MovesNoElementWhenItGrows) {
  PieceVector<int> pieces;
  std::vector<const int*> addresses;
  addresses.reserve(1'000);
  for (int element = 0; element < 1'000; ++element) addresses.push_back(&pieces.add(element));
  for (std::size_t place = 0; place < addresses.size(); ++place) ASSERT_EQ(&pieces[place], addresses[place]);
}

TEST(PieceVectorTest, EndsEachElementOnce) {
  const auto counted = std::make_shared<int>(0);
  PieceVector<std::shared_ptr<int>> pieces;
  for (int element = 0; element < 100; ++element) pieces.add(counted);
  EXPECT_EQ(counted.use_count(), 101);
  PieceVector<std::shared_ptr<int>> others = std::move(pieces);
  EXPECT_EQ(counted.use_count(), 101);
  EXPECT_EQ(others.size(), 100U);
  others.clear();
  EXPECT_EQ(counted.use_count(), 1);
  EXPECT_EQ(others.size(), 0U);
  others.add(counted);
  EXPECT_EQ(others[0], counted);
  others = PieceVector<std::shared_ptr<int>>();
  EXPECT_EQ(counted.use_count(), 1);
}

}  // namespace
}  // namespace tonewerk
