// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/JournalLog.h"

#include <gmock/gmock.h>
#include <memory>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/log/StandardLog.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsSupersetOf;

std::string streamOf(int fileDescriptor) {
  struct stat status {};
  EXPECT_EQ(fstat(fileDescriptor, &status), 0);
  return std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
}

// Sets an environment variable while it exists.
class ScopedVariable {
 public:
  ScopedVariable(const char* name, const std::string& value) : name_(name) { setenv(name, value.c_str(), 1); }
  ScopedVariable(const ScopedVariable&) = delete;
  ScopedVariable& operator=(const ScopedVariable&) = delete;
  ~ScopedVariable() { unsetenv(name_); }

 private:
  const char* name_;
};

TEST(JournalLogTest, AnEntryHasTheFieldsToSearchBy) {
  EXPECT_THAT(JournalLog::fields("com.orvane.tonewerk", "twrr", LogLevel::kError, "a\nb=c"),
              IsSupersetOf({"MESSAGE=a\nb=c", "PRIORITY=3", "TONEWERK_SUBSYSTEM=com.orvane.tonewerk",
                            "TONEWERK_CATEGORY=twrr", "TONEWERK_LEVEL=error"}));
}

TEST(JournalLogTest, LevelsBecomeTheSystemsPriorities) {
  const auto priorityOf = [](LogLevel level) { return JournalLog::fields("s", "c", level, "m")[1]; };
  EXPECT_EQ(priorityOf(LogLevel::kDebug), "PRIORITY=7");
  EXPECT_EQ(priorityOf(LogLevel::kInfo), "PRIORITY=6");
  EXPECT_EQ(priorityOf(LogLevel::kDefault), "PRIORITY=5");
  EXPECT_EQ(priorityOf(LogLevel::kError), "PRIORITY=3");
}

TEST(JournalLogTest, TheJournalIsRecognisedByDeviceAndInode) {
  const std::string stream = streamOf(STDERR_FILENO);
  EXPECT_TRUE(JournalLog::isJournal(stream, STDERR_FILENO));
  EXPECT_FALSE(JournalLog::isJournal(stream + "1", STDERR_FILENO));
  EXPECT_FALSE(JournalLog::isJournal("", STDERR_FILENO));
  EXPECT_FALSE(JournalLog::isJournal(stream, -1));
}

TEST(StandardLogTest, IsTheJournalOnlyWhenStandardErrorIs) {
  const ManualClock clock;
  {
    const ScopedVariable stream("JOURNAL_STREAM", streamOf(STDERR_FILENO));
    EXPECT_NE(dynamic_cast<JournalLog*>(makeStandardLog(clock).get()), nullptr);
  }
  const ScopedVariable stream("JOURNAL_STREAM", "1:1");
  EXPECT_EQ(dynamic_cast<JournalLog*>(makeStandardLog(clock).get()), nullptr);
}

TEST(StandardLogTest, TakesItsThresholdFromTheEnvironment) {
  const ManualClock clock;
  const ScopedVariable wanted("TONEWERK_LOG", "twrr=debug,error");
  const auto log = makeStandardLog(clock);
  EXPECT_TRUE(log->isEnabled("twrr", LogLevel::kDebug));
  EXPECT_FALSE(log->isEnabled("twrs", LogLevel::kDefault));
}

TEST(StandardLogTest, LogsAThresholdThatCannotBeParsed) {
  const ManualClock clock;
  const ScopedVariable wanted("TONEWERK_LOG", "loud");
  testing::internal::CaptureStderr();
  const auto log = makeStandardLog(clock);
  EXPECT_THAT(testing::internal::GetCapturedStderr(), HasSubstr("TONEWERK_LOG is not understood: \"loud\""));
  EXPECT_TRUE(log->isEnabled("twrr", LogLevel::kDefault));
  EXPECT_FALSE(log->isEnabled("twrr", LogLevel::kInfo));
}

}  // namespace
}  // namespace tonewerk
