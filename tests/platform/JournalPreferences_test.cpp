// SPDX-License-Identifier: Apache-2.0
#include "platform/JournalPreferences.h"

#include <chrono>
#include <cstdint>
#include <gmock/gmock.h>
#include <string>

#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

class JournalPreferencesTest : public testing::Test {
 protected:
  void set(const char* key, const Value& value) {
    preferences_.configure("com.orvane.tonewerk.store", key, value);
  }
  JournalPreferences read() { return readJournalPreferences(preferences_, problems_); }

  MemoryPreferenceStore preferences_;
  std::string problems_ = "of an earlier call";
};

TEST_F(JournalPreferencesTest, HasTheDefaults) {
  const JournalPreferences read = this->read();
  EXPECT_EQ(read.bytes, std::uint64_t{64} << 20);
  EXPECT_EQ(read.syncInterval, 5s);
  EXPECT_EQ(read.keepsDropped, 0s);
  EXPECT_EQ(problems_, "");
}

TEST_F(JournalPreferencesTest, HasWhatPeopleSet) {
  set("journal_megabytes", 1.5);
  set("journal_sync_seconds", 0.25);
  set("journal_days", 2);
  const JournalPreferences read = this->read();
  EXPECT_EQ(read.bytes, std::uint64_t{3} << 19);
  EXPECT_EQ(read.syncInterval, 250ms);
  EXPECT_EQ(read.keepsDropped, 48h);
  EXPECT_EQ(problems_, "");
}

TEST_F(JournalPreferencesTest, AWrongValueCountsAsTheDefaultAndIsNamed) {
  set("journal_megabytes", -1);
  set("journal_sync_seconds", "often");
  set("journal_days", 1);
  const JournalPreferences read = this->read();
  EXPECT_EQ(read.bytes, std::uint64_t{64} << 20);
  EXPECT_EQ(read.syncInterval, 5s);
  EXPECT_EQ(read.keepsDropped, 24h);
  EXPECT_EQ(
      problems_,
      "journal_megabytes must be a number from 0, not -1; journal_sync_seconds must be a number from 0 to "
      "3600, not \"often\"");
}

TEST_F(JournalPreferencesTest, AHugeValueIsCutToWhatItsTypeHolds) {
  set("journal_megabytes", 1e300);
  set("journal_days", 1e300);
  const JournalPreferences read = this->read();
  EXPECT_EQ(read.bytes, std::uint64_t{1'000'000'000} << 20);
  EXPECT_EQ(read.keepsDropped, std::chrono::seconds(std::int64_t{86'400} * 1'000'000'000));
}

}  // namespace
}  // namespace tonewerk
