// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreDiagwire.h"

#include <gtest/gtest.h>

#include "platform/Log.h"
#include "platform/accounts/Accounts.h"
#include "platform/linux/protobuf/ProtozeroReader.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/pb/AudioIssueDetected.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryJsonService.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kLongEnough{30};

TEST(StoreDiagwireTest, KeepsTheRecordWithItsTimeAndIdentifier) {
  const TemporaryDirectory temporary;
  const ManualClock clock;
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  const MemoryJsonService json;
  const MemoryPreferenceStore preferences;
  Accounts accounts(990, clock);
  ReportStore store(temporary.path("state"), json, preferences, clock, accounts, category);
  StoreDiagwire diagwire(store, clock);
  diagwiremetrics::AudioIssueDetected record;
  record.node = "mixer";
  diagwire.post(record.kMetricIdentifier, record);
  ASSERT_TRUE(store.flush(kLongEnough));

  SqliteDatabase database;
  ASSERT_TRUE(
      database.open(temporary.path("state/reports.db"), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  SqliteStatement select = database.prepare("SELECT posted_at, identifier, record FROM metric");
  ASSERT_EQ(select.step(), SqliteStatement::Step::kRow);
  EXPECT_EQ(select.number(0), clock.now());
  EXPECT_EQ(select.integer(1), 0x5B0003);
  const std::string bytes = select.bytes(2);
  ProtozeroReader reader(bytes);
  diagwiremetrics::AudioIssueDetected read;
  EXPECT_TRUE(read.readFrom(reader));
  EXPECT_EQ(read, record);
}

}  // namespace
}  // namespace tonewerk
