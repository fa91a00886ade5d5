// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <limits>

#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "platform/linux/preferences/TomlText.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

constexpr char kDomain[] = "com.orvane.test";

struct OnDisk {
  TemporaryDirectory directory;
  MemoryLog log;
  LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  TomlPreferenceStore store{directory.path("configuration"), directory.path("state"), category};

  void configure(const ValueMap& values) {
    std::string problem;
    std::filesystem::create_directories(directory.path("configuration"));
    std::ofstream(directory.path("configuration/" + std::string(kDomain) + ".toml"))
        << *tomlText(values, problem);
  }
};

struct InMemory {
  MemoryPreferenceStore store;

  void configure(const ValueMap& values) {
    for (const ValueMapEntry& entry : values) store.configure(kDomain, entry.key, entry.value);
  }
};

// The contract of all preference stores.
template <typename Kind>
class PreferenceStoreContract : public testing::Test {
 protected:
  PreferenceStore& store() { return kind_.store; }
  void configure(const ValueMap& values) { kind_.configure(values); }

  Kind kind_;
};

using Kinds = testing::Types<OnDisk, InMemory>;
TYPED_TEST_SUITE(PreferenceStoreContract, Kinds);

TYPED_TEST(PreferenceStoreContract, ReadsWhatWasWritten) {
  const ValueMap values{{"boolean", true},
                        {"integer", -5},
                        {"double", 2.0},
                        {"text", "a \"b\"\n\t\\ \xC3\xA4"},
                        {"date", Date{1'763'633'880.25}},
                        {"array", ValueArray{1, "x", ValueArray()}},
                        {"map", ValueMap{{"name", "local"}, {"events", ValueArray{"com.orvane.*"}}}},
                        {"tables", ValueArray{ValueMap{{"name", "a"}}, ValueMap{{"name", "b"}}}},
                        {"a key with.dots and \"quotes\"", 1},
                        {"", 0}};
  for (const ValueMapEntry& entry : values) {
    std::string problem;
    EXPECT_FALSE(this->store().write(kDomain, entry.key, entry.value, &problem)) << problem;
    EXPECT_EQ(this->store().read(kDomain, entry.key), entry.value) << entry.key.string();
    EXPECT_EQ(this->store().read(kDomain, entry.key)->kind(), entry.value.kind()) << entry.key.string();
  }
  EXPECT_EQ(this->store().readAll(kDomain), values);
}

TYPED_TEST(PreferenceStoreContract, AnUnsetKeyReadsAsNone) {
  EXPECT_EQ(this->store().read(kDomain, "a"), std::nullopt);
  EXPECT_EQ(this->store().readAll(kDomain), ValueMap());
}

TYPED_TEST(PreferenceStoreContract, AWrittenValueOverridesTheConfiguration) {
  this->configure({{"a", 1}, {"b", 2}});
  EXPECT_EQ(this->store().read(kDomain, "a"), Value(1));
  EXPECT_FALSE(this->store().write(kDomain, "a", 5));
  EXPECT_EQ(this->store().read(kDomain, "a"), Value(5));
  EXPECT_EQ(this->store().readAll(kDomain), (ValueMap{{"a", 5}, {"b", 2}}));
}

TYPED_TEST(PreferenceStoreContract, RemovingAWrittenValueShowsTheConfigurationAgain) {
  this->configure({{"a", 1}});
  EXPECT_FALSE(this->store().write(kDomain, "a", 5));
  EXPECT_FALSE(this->store().remove(kDomain, "a"));
  EXPECT_EQ(this->store().read(kDomain, "a"), Value(1));
}

TYPED_TEST(PreferenceStoreContract, AValueOfTheConfigurationCannotBeRemoved) {
  this->configure({{"a", 1}});
  std::string problem;
  EXPECT_EQ(this->store().remove(kDomain, "a", &problem), std::errc::operation_not_permitted);
  EXPECT_NE(problem, "");
  EXPECT_EQ(this->store().read(kDomain, "a"), Value(1));
}

TYPED_TEST(PreferenceStoreContract, AnUnsetKeyCannotBeRemoved) {
  EXPECT_EQ(this->store().remove(kDomain, "a"), std::errc::no_such_file_or_directory);
  EXPECT_FALSE(this->store().write(kDomain, "a", 1));
  EXPECT_FALSE(this->store().remove(kDomain, "a"));
  EXPECT_EQ(this->store().remove(kDomain, "a"), std::errc::no_such_file_or_directory);
}

TYPED_TEST(PreferenceStoreContract, LaterChangesOfTheConfigurationShowWhereNothingElseWasWritten) {
  this->configure({{"a", 1}, {"b", 1}});
  EXPECT_FALSE(this->store().write(kDomain, "a", 1));  // the same as the configuration
  EXPECT_FALSE(this->store().write(kDomain, "b", 2));
  this->configure({{"a", 7}, {"b", 7}});
  EXPECT_EQ(this->store().read(kDomain, "a"), Value(7));
  EXPECT_EQ(this->store().read(kDomain, "b"), Value(2));
}

TYPED_TEST(PreferenceStoreContract, ValuesOfDifferentTypesDiffer) {
  this->configure({{"a", 1}});
  EXPECT_FALSE(this->store().write(kDomain, "a", true));
  EXPECT_EQ(this->store().read(kDomain, "a")->kind(), Value::Kind::kBoolean);
}

TYPED_TEST(PreferenceStoreContract, DomainsThatAreNoPlainNamesAreRefused) {
  for (const std::string_view domain : {std::string_view(""), std::string_view("a/b"), std::string_view(".."),
                                        std::string_view("../x"), std::string_view("a\0b", 3)}) {
    std::string problem;
    EXPECT_EQ(this->store().write(domain, "a", 1, &problem), std::errc::invalid_argument);
    EXPECT_NE(problem, "");
    EXPECT_EQ(this->store().remove(domain, "a"), std::errc::invalid_argument);
    EXPECT_EQ(this->store().read(domain, "a"), std::nullopt);
  }
}

TYPED_TEST(PreferenceStoreContract, AnIntegerBeyondSixtyThreeBitsIsRefused) {
  constexpr std::uint64_t kMax = std::numeric_limits<std::int64_t>::max();
  EXPECT_FALSE(this->store().write(kDomain, "a", kMax));
  std::string problem;
  EXPECT_EQ(this->store().write(kDomain, "a", kMax + 1, &problem), std::errc::result_out_of_range);
  EXPECT_NE(problem, "");
  EXPECT_EQ(this->store().write(kDomain, "a", ValueArray{ValueMap{{"deep", kMax + 1}}}),
            std::errc::result_out_of_range);
  EXPECT_EQ(this->store().read(kDomain, "a"), Value(kMax));
}

}  // namespace
}  // namespace tonewerk
