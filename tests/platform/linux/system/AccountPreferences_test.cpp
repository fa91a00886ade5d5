// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/AccountPreferences.h"

#include <gmock/gmock.h>
#include <system_error>

#include "platform/Log.h"
#include "platform/PreferenceSchema.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class AccountPreferencesTest : public testing::Test {
 protected:
  void set(std::string_view key, const Value& value) {
    ASSERT_EQ(preferences.write(AccountPreferences::kPreferenceDomain, key, value), std::error_code());
  }
  void apply() { applyAccountPreferences(accounts, preferences, category); }
  std::uint64_t total(Resource resource) { return accounts->totals().total(resource); }

  MemoryLog log;
  const LogCategory category{log, "com.example", "twrs"};
  MemoryPreferenceStore preferences;
  TestAccounts accounts{990};
};

TEST_F(AccountPreferencesTest, WithoutPreferencesRootAndTheOwnerAreTrusted) {
  apply();
  EXPECT_TRUE(accounts->of(0)->isTrusted());
  EXPECT_TRUE(accounts->of(990)->isTrusted());
  EXPECT_FALSE(accounts->of(1)->isTrusted());
  EXPECT_THAT(log.lines(), IsEmpty());
}

TEST_F(AccountPreferencesTest, UsersAreNamedByNameAndByNumber) {
  set("trusted_users", ValueArray{"daemon", 1500});
  apply();
  EXPECT_TRUE(accounts->of(1)->isTrusted());  // daemon has this number on every Debian
  EXPECT_TRUE(accounts->of(1500)->isTrusted());
  set("trusted_users", ValueArray{});
  apply();
  EXPECT_FALSE(accounts->of(1500)->isTrusted());
}

TEST_F(AccountPreferencesTest, WrongUsersAreNamedAndTheOthersTrusted) {
  set("trusted_users", ValueArray{"nobody-has-this-name", -1, 4294967295, 1.5, 1500});
  apply();
  EXPECT_TRUE(accounts->of(1500)->isTrusted());
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError),
              ElementsAre(HasSubstr("names no user of this system: nobody-has-this-name"),
                          HasSubstr("of this system: -1"), HasSubstr("of this system: 4294967295"),
                          HasSubstr("of this system: 1.5")));
}

TEST_F(AccountPreferencesTest, AListThatIsNoListTrustsNobody) {
  set("trusted_users", "1500");
  apply();
  EXPECT_FALSE(accounts->of(1500)->isTrusted());
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError), ElementsAre(HasSubstr("trusted_users")));
}

TEST_F(AccountPreferencesTest, TotalsAreSetInMebibytesAndFallBack) {
  const std::uint64_t fallback = total(Resource::kKeptBytes);
  set("kept_megabytes", 64);
  set("unfinished_megabytes", 1.5);
  set("snapshot_megabytes", 0);
  apply();
  EXPECT_EQ(total(Resource::kKeptBytes), 64 * kMiB);
  EXPECT_EQ(total(Resource::kUnfinishedBytes), kMiB + kMiB / 2);
  EXPECT_EQ(total(Resource::kSnapshotBytes), 64 * kMiB);
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError), ElementsAre(HasSubstr("snapshot_megabytes")));
  ASSERT_EQ(preferences.remove(AccountPreferences::kPreferenceDomain, "kept_megabytes"), std::error_code());
  apply();
  EXPECT_EQ(total(Resource::kKeptBytes), fallback);
}

TEST_F(AccountPreferencesTest, TheSchemaKnowsTheDefaults) {
  for (const ResourceFacts& facts : kResources) {
    if (facts.preference.empty()) continue;
    const Preference* preference = findPreference(AccountPreferences::kPreferenceDomain, facts.preference);
    ASSERT_NE(preference, nullptr) << facts.preference;
    EXPECT_EQ(preference->fallback->number() * static_cast<double>(kMiB), static_cast<double>(facts.total));
  }
}

}  // namespace
}  // namespace tonewerk
