// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/RecoveryAttempts.h"

#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>

#include "platform/Log.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::Contains;
using testing::HasSubstr;
using testing::IsEmpty;

class RecoveryAttemptsTest : public testing::Test {
 protected:
  RecoveryAttemptsTest() { makeJournal(); }

  void makeJournal() const {
    std::filesystem::create_directories(journal());
    std::ofstream(journal() + "/a.segment") << "records";
  }
  // Starts that end while they play.
  void crash(int times) {
    for (int start = 0; start < times; ++start) RecoveryAttempts(journal(), category_).begin();
  }
  std::string journal() const { return directory_.path("journal"); }
  bool isThere() const { return std::filesystem::exists(journal() + "/a.segment"); }
  bool isAside() const { return std::filesystem::exists(journal() + ".failed/a.segment"); }

  TemporaryDirectory directory_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
};

TEST_F(RecoveryAttemptsTest, AJournalHasThirtyAttempts) {
  crash(RecoveryAttempts::kMost);
  EXPECT_TRUE(isThere());
  EXPECT_THAT(log_.textsAt(LogLevel::kError), IsEmpty());
  const RecoveryAttempts next(journal(), category_);
  EXPECT_FALSE(isThere());
  EXPECT_TRUE(isAside());
  EXPECT_THAT(log_.textsAt(LogLevel::kError), Contains(HasSubstr("is moved to")));
}

TEST_F(RecoveryAttemptsTest, AnAttemptThatSucceedsEndsTheCount) {
  crash(RecoveryAttempts::kMost - 1);
  RecoveryAttempts last(journal(), category_);
  last.begin();
  last.finish();
  crash(RecoveryAttempts::kMost);
  EXPECT_TRUE(isThere());
}

TEST_F(RecoveryAttemptsTest, TheNextJournalTakesThePlaceOfTheOneMovedAside) {
  for (int journals = 0; journals < 2; ++journals) {
    makeJournal();
    crash(RecoveryAttempts::kMost);
    const RecoveryAttempts next(journal(), category_);
    EXPECT_TRUE(isAside());
    EXPECT_FALSE(isThere());
  }
}

TEST_F(RecoveryAttemptsTest, WhatIsNoNumberCountsAsNone) {
  std::ofstream(journal() + "/attempts") << "many";
  const RecoveryAttempts next(journal(), category_);
  EXPECT_TRUE(isThere());
}

TEST_F(RecoveryAttemptsTest, AnAttemptThatCannotBeWrittenIsSaid) {
  std::filesystem::remove_all(journal());
  crash(1);
  EXPECT_THAT(log_.textsAt(LogLevel::kError), Contains(HasSubstr("cannot write")));
}

}  // namespace
}  // namespace tonewerk
