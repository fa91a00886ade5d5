// SPDX-License-Identifier: Apache-2.0
#include "values/Nesting.h"

#include <gtest/gtest.h>

#include "values/Value.h"

namespace tonewerk {
namespace {

TEST(NestingTest, AScalarHasNoLevels) {
  EXPECT_TRUE(nestsWithin(Value(1), 0));
  EXPECT_TRUE(nestsWithin(Value("text"), 0));
  EXPECT_FALSE(nestsWithin(Value(ValueArray{}), 0));
  EXPECT_FALSE(nestsWithin(Value(ValueMap{}), 0));
}

TEST(NestingTest, TheDeepestLevelCounts) {
  const Value nested(ValueMap{{"flat", 1}, {"deep", ValueArray{1, ValueMap{{"inner", true}}}}});
  EXPECT_TRUE(nestsWithin(nested, 3));
  EXPECT_FALSE(nestsWithin(nested, 2));
}

}  // namespace
}  // namespace tonewerk
