// SPDX-License-Identifier: Apache-2.0
#include "platform/PreferenceSchema.h"

#include <gmock/gmock.h>
#include <limits>
#include <set>
#include <string>
#include <utility>

namespace tonewerk {
namespace {

TEST(PreferenceSchemaTest, HasEachPreferenceOnce) {
  std::set<std::pair<std::string_view, std::string_view>> seen;
  for (const Preference& preference : preferenceSchema()) {
    EXPECT_TRUE(seen.emplace(preference.domain, preference.key).second) << preference.key;
    EXPECT_EQ(findPreference(preference.domain, preference.key), &preference);
  }
  EXPECT_GT(seen.size(), 15U);
  EXPECT_EQ(findPreference("com.orvane.metricon", "max_days"), nullptr);
}

TEST(PreferenceSchemaTest, ADefaultIsAValidValue) {
  for (const Preference& preference : preferenceSchema()) {
    if (!preference.fallback) continue;
    EXPECT_EQ(problemWith(preference, *preference.fallback), std::nullopt);
  }
}

TEST(PreferenceSchemaTest, PreferencesThatTheDaemonSetsHaveNoDefault) {
  for (const Preference& preference : preferenceSchema()) {
    if (preference.keeper != PreferenceKeeper::kDaemon) continue;
    EXPECT_FALSE(preference.fallback) << preference.key;
  }
}

// Meanings are shown indented by four columns, also in terminals of sixty columns.
TEST(PreferenceSchemaTest, AMeaningIsOneShortLine) {
  for (const Preference& preference : preferenceSchema()) {
    EXPECT_THAT(preference.meaning.size(), testing::AllOf(testing::Ge(5U), testing::Le(56U)))
        << preference.key;
  }
}

TEST(PreferenceSchemaTest, AFactIsABooleanAndNoPreference) {
  for (const Preference& fact : deviceFactSchema()) {
    EXPECT_EQ(fact.domain, kDeviceFacts);
    EXPECT_EQ(findPreference(kDeviceFacts, fact.key), &fact);
    EXPECT_NE(problemWith(fact, "yes"), std::nullopt);
    for (const Preference& preference : preferenceSchema()) EXPECT_NE(preference.key, fact.key);
  }
  EXPECT_THAT(knownKeys(kDeviceFacts), testing::ElementsAre("InternalBuild", "HapticLeakCapture"));
}

TEST(PreferenceSchemaTest, NamesTheKeyThatAnUnknownOneIsCloseTo) {
  const ValueMap set{{"max_dais", 5}, {"max_days", 7}, {"colour", "red"}};
  EXPECT_THAT(unknownKeys("com.orvane.tonewerk.store", set),
              testing::UnorderedElementsAre(
                  "the daemon does not read max_dais of com.orvane.tonewerk.store; did you mean 'max_days'?",
                  "the daemon does not read colour of com.orvane.tonewerk.store"));
  EXPECT_THAT(unknownKeys("org.example", set), testing::IsEmpty()) << "others may keep theirs there";
}

// "5, in MiB" must not be said of a text.
TEST(PreferenceSchemaTest, OnlyNumbersHaveUnits) {
  for (const Preference& preference : preferenceSchema()) {
    const bool isNumber =
        preference.type == PreferenceType::kNumber || preference.type == PreferenceType::kInteger;
    EXPECT_TRUE(preference.unit.empty() || isNumber) << preference.key;
    EXPECT_TRUE(!preference.key.ends_with("_megabytes") || preference.unit == "MiB") << preference.key;
    EXPECT_TRUE(!preference.key.ends_with("_days") || preference.unit == "days") << preference.key;
    EXPECT_THAT(effectText(preference.effect), testing::Not(testing::IsEmpty())) << preference.key;
  }
}

TEST(PreferenceSchemaTest, ChecksBothEndsOfARange) {
  const Preference& cycle = *findPreference("com.orvane.tonewerk.twreporting", "io_cycle");
  EXPECT_EQ(problemWith(cycle, 0), std::nullopt);
  EXPECT_EQ(problemWith(cycle, 2147483647), std::nullopt);
  EXPECT_NE(problemWith(cycle, -1), std::nullopt);
  EXPECT_NE(problemWith(cycle, std::int64_t{2147483648}), std::nullopt);
  EXPECT_NE(problemWith(cycle, 1.0), std::nullopt);
  const Preference& days = *findPreference("com.orvane.tonewerk.store", "max_days");
  EXPECT_EQ(problemWith(days, 1.0), std::nullopt);
  EXPECT_EQ(problemWith(days, 1e300), std::nullopt);
  EXPECT_NE(problemWith(days, 0.999), std::nullopt);
  EXPECT_NE(problemWith(days, std::numeric_limits<double>::quiet_NaN()), std::nullopt);
}

TEST(PreferenceSchemaTest, DistinguishesTypes) {
  const std::pair<PreferenceType, Value> fitting[] = {
      {PreferenceType::kBoolean, true},
      {PreferenceType::kInteger, 5},
      {PreferenceType::kNumber, 2.5},
      {PreferenceType::kText, "a"},
      {PreferenceType::kTexts, ValueArray{"a"}},
      {PreferenceType::kUsers, ValueArray{"a", 1}},
      {PreferenceType::kTables, ValueArray{ValueMap{{"a", 1}}}},
      {PreferenceType::kTable, ValueMap{{"a", 1}}},
  };
  for (const auto& [type, own] : fitting) {
    for (const auto& [otherType, value] : fitting) {
      const Preference preference{.domain = "d", .key = "k", .type = type, .fallback = {}, .meaning = "m"};
      const bool suits = type == otherType ||
                         (type == PreferenceType::kNumber && otherType == PreferenceType::kInteger) ||
                         (type == PreferenceType::kUsers && otherType == PreferenceType::kTexts);
      EXPECT_EQ(problemWith(preference, value).has_value(), !suits)
          << typeText(preference) << " " << value.text();
    }
  }
  const Preference any{
      .domain = "d", .key = "k", .type = PreferenceType::kAny, .fallback = {}, .meaning = "m"};
  EXPECT_EQ(problemWith(any, ValueArray{}), std::nullopt);
}

}  // namespace
}  // namespace tonewerk
