// SPDX-License-Identifier: Apache-2.0
#include "values/GrowingDelay.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

TEST(GrowingDelayTest, DoublesUpToItsLimit) {
  GrowingDelay delay(milliseconds(250), milliseconds(900));
  for (const int expected : {250, 500, 900, 900}) EXPECT_EQ(delay.next(), milliseconds(expected));
}

TEST(GrowingDelayTest, GrowsByTheGivenFactor) {
  GrowingDelay delay(milliseconds(200), milliseconds(400), 1.5);
  for (const int expected : {200, 300, 400, 400}) EXPECT_EQ(delay.next(), milliseconds(expected));
}

TEST(GrowingDelayTest, StartsAgainAfterASuccess) {
  GrowingDelay delay(milliseconds(250), milliseconds(4000));
  delay.next();
  delay.next();
  delay.reset();
  EXPECT_EQ(delay.next(), milliseconds(250));
}

}  // namespace
}  // namespace tonewerk
