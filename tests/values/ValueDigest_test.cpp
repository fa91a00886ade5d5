// SPDX-License-Identifier: Apache-2.0
#include "values/ValueDigest.h"

#include <algorithm>
#include <cmath>
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <utility>
#include <vector>

#include "support/ValueGenerators.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

ValueDigest digestOf(const Value& value) { return ValueDigest::of({{"v", value}}); }

TEST(ValueDigestTest, EqualNumbersOfDifferentFormsHaveOneDigest) {
  EXPECT_EQ(digestOf(1), digestOf(true));
  EXPECT_EQ(digestOf(1), digestOf(1.0));
  EXPECT_EQ(digestOf(1), digestOf(std::uint64_t{1}));
  EXPECT_EQ(digestOf(0), digestOf(-0.0));
  EXPECT_EQ(digestOf(-3), digestOf(-3.0));
  EXPECT_EQ(digestOf(std::uint64_t{1} << 63), digestOf(9223372036854775808.0));
  EXPECT_EQ(digestOf(std::nan("")), digestOf(-std::nan("")));
  EXPECT_EQ(digestOf(Date{0.0}), digestOf(Date{-0.0}));
}

TEST(ValueDigestTest, SimilarValuesThatDifferHaveDifferentDigests) {
  const std::vector<Value> all{0,
                               1,
                               -1,
                               0.5,
                               "",
                               "1",
                               Date{1.0},
                               std::uint64_t{0xFFFFFFFFFFFFFFFF},
                               (std::int64_t{1} << 53) + 1,
                               9007199254740992.0,
                               std::nan(""),
                               HUGE_VAL,
                               ValueArray(),
                               ValueArray({1}),
                               ValueArray({1, 1}),
                               ValueArray{Value(ValueArray())},
                               ValueMap(),
                               ValueMap{{"v", 1}},
                               std::string(1, '\0'),
                               std::string(8, '\0'),
                               std::string(9, '\0')};
  for (std::size_t a = 0; a < all.size(); ++a) {
    for (std::size_t b = 0; b < a; ++b) {
      EXPECT_NE(digestOf(all[a]), digestOf(all[b])) << all[a].text() << " and " << all[b].text();
    }
  }
}

TEST(ValueDigestTest, OrderMattersInAnArrayButNotInAMap) {
  EXPECT_EQ(ValueDigest::of({{"a", 1}, {"b", 2}}), ValueDigest::of({{"b", 2}, {"a", 1}}));
  EXPECT_NE(ValueDigest::of({{"a", 1}, {"b", 2}}), ValueDigest::of({{"a", 2}, {"b", 1}}));
  EXPECT_NE(digestOf(ValueArray({1, 2})), digestOf(ValueArray({2, 1})));
}

TEST(ValueDigestTest, OneByteOfALargeTextMatters) {
  std::string text(std::size_t{1} << 20, 'x');
  const ValueDigest before = digestOf(text);
  EXPECT_EQ(before, digestOf(text));
  for (const std::size_t at : {std::size_t{0}, text.size() / 2, text.size() - 1}) {
    text[at] = 'y';
    EXPECT_NE(before, digestOf(text)) << at;
    text[at] = 'x';
  }
}

RC_GTEST_PROP(ValueDigestTest, IsEqualWhereMapsAreAndNowhereElse, ()) {
  const ValueMap a = *generate::map();
  const ValueMap b = *generate::map();
  RC_ASSERT((ValueDigest::of(a) == ValueDigest::of(b)) == (a == b));
}

RC_GTEST_PROP(ValueDigestTest, IsEqualWhereValuesAreAndNowhereElse, ()) {
  const Value a = *generate::value(1);
  const Value b = *generate::value(1);
  RC_ASSERT((digestOf(a) == digestOf(b)) == (a == b));
}

RC_GTEST_PROP(ValueDigestTest, DoesNotDependOnTheOrderOfAMap, ()) {
  const ValueMap map = *generate::map();
  std::vector<ValueMapEntry> entries(map.begin(), map.end());
  std::reverse(entries.begin(), entries.end());
  ValueMap reversed;
  for (const ValueMapEntry& entry : entries) reversed.set(entry.key, entry.value);
  RC_ASSERT(ValueDigest::of(map) == ValueDigest::of(reversed));
}

}  // namespace
}  // namespace tonewerk
