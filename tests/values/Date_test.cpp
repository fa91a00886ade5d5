// SPDX-License-Identifier: Apache-2.0
#include "values/Date.h"

#include <gtest/gtest.h>
#include <limits>
#include <rapidcheck/gtest.h>

#include "support/ValueGenerators.h"

namespace tonewerk {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

TEST(DateTest, TextHasUpToSixFractionDigits) {
  EXPECT_EQ(textOf(Date{1'763'633'880.0}), "2025-11-20T10:18:00Z");
  EXPECT_EQ(textOf(Date{1'763'633'880.25}), "2025-11-20T10:18:00.25Z");
  EXPECT_EQ(textOf(Date{0.000001}), "1970-01-01T00:00:00.000001Z");
  EXPECT_EQ(textOf(Date{0.0000004}), "1970-01-01T00:00:00Z");
  EXPECT_EQ(textOf(Date{59.9999999}), "1970-01-01T00:01:00Z");
}

TEST(DateTest, TextOfDatesBeforeTheEpochAndOfLeapDays) {
  EXPECT_EQ(textOf(Date{-0.5}), "1969-12-31T23:59:59.5Z");
  EXPECT_EQ(textOf(Date{951'782'400.0}), "2000-02-29T00:00:00Z");
}

TEST(DateTest, ADateThatTheTextCannotExpressBecomesTheNearestOne) {
  EXPECT_EQ(textOf(Date{kInfinity}), "9999-12-31T23:59:59.999999Z");
  EXPECT_EQ(textOf(Date{253'402'300'800.0}), "9999-12-31T23:59:59.999999Z");
  EXPECT_EQ(textOf(Date{-kInfinity}), "0000-01-01T00:00:00Z");
  EXPECT_EQ(textOf(Date{kNaN}), "1970-01-01T00:00:00Z");
}

TEST(DateTest, EqualityComparesInstants) {
  EXPECT_EQ(Date{1.0}, Date{1.0});
  EXPECT_EQ(Date{kNaN}, Date{kNaN});
  EXPECT_FALSE(Date{1.0} == Date{1.000001});
}

RC_GTEST_PROP(DateTest, LaterDatesNeverHaveEarlierTexts, ()) {
  const Date a = *generate::date();
  const Date b = *generate::date();
  const auto comparable = [](Date date) {
    std::string text = textOf(date);
    text.pop_back();  // "Z" sorts after the point of a fraction
    return text;
  };
  if (a.seconds <= b.seconds) RC_ASSERT(comparable(a) <= comparable(b));
}

}  // namespace
}  // namespace tonewerk
