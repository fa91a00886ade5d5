// SPDX-License-Identifier: Apache-2.0
#include "values/SharedString.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <utility>

namespace tonewerk {
namespace {

TEST(SharedStringTest, ACopySharesTheCharacters) {
  const SharedString text("level");
  const SharedString copy = text;  // NOLINT(performance-unnecessary-copy-initialization)
  EXPECT_TRUE(copy.sharesStorageWith(text));
  EXPECT_EQ(copy.view().data(), text.view().data());
}

TEST(SharedStringTest, ATextThatWasMovedFromIsEmpty) {
  SharedString text("level");
  const SharedString taken = std::move(text);
  EXPECT_TRUE(text.empty());  // NOLINT(bugprone-use-after-move)
  EXPECT_EQ(taken, "level");
}

TEST(SharedStringTest, MayBeAssignedToItself) {
  SharedString text("level");
  SharedString& same = text;
  text = same;
  EXPECT_EQ(text, "level");
}

RC_GTEST_PROP(SharedStringTest, HoldsWhatItWasMadeOf, (const std::string& text)) {
  const SharedString shared(text);
  RC_ASSERT(shared.string() == text);
  RC_ASSERT(shared.size() == text.size());
  RC_ASSERT(shared.hash() == SharedString::hashOf(text));
}

RC_GTEST_PROP(SharedStringTest, EqualsByCharacters, (const std::string& a, const std::string& b)) {
  RC_ASSERT((SharedString(a) == SharedString(b)) == (a == b));
  RC_ASSERT(SharedString(a) == SharedString(a));
}

}  // namespace
}  // namespace tonewerk
