// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/CondensingLog.h"

#include <chrono>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "support/ForwardingLog.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using ::testing::AllOf;
using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsSupersetOf;
using ::testing::SizeIs;

constexpr int kMost = CondensingLog::kMaxEqualLines;

class CondensingLogTest : public ::testing::Test {
 protected:
  void write(const std::string& message, int times = 1, LogLevel level = LogLevel::kDefault,
             const std::string& category = "twri") {
    for (int time = 0; time < times; ++time) {
      log->write("com.orvane.tonewerk", category, level, message);
    }
  }
  std::vector<std::string> written(const std::string& category = "twri") const {
    return inner.textsOf(category);
  }

  MemoryLog inner;
  ManualClock clock;
  std::optional<CondensingLog> log{std::in_place, std::make_unique<ForwardingLog>(inner), clock};
};

TEST_F(CondensingLogTest, PassesDifferentLinesOn) {
  for (int line = 0; line < 100; ++line) write("line " + std::to_string(line % 2));
  EXPECT_THAT(written(), SizeIs(100));
}

TEST_F(CondensingLogTest, PassesTheFirstEqualLinesOn) {
  write("a", kMost);
  log.reset();
  EXPECT_THAT(written(), AllOf(SizeIs(kMost), Each("a")));
}

TEST_F(CondensingLogTest, SaysBeforeTheNextLineHowManyEqualOnesAreMissing) {
  write("a", kMost + 3);
  EXPECT_THAT(written(), SizeIs(kMost));
  write("b");
  const std::vector<std::string> lines = written();
  ASSERT_THAT(lines, SizeIs(kMost + 2));
  EXPECT_EQ(lines[kMost], "equal lines left out: 3");
  EXPECT_EQ(lines[kMost + 1], "b");
}

TEST_F(CondensingLogTest, SaysAtTheEndHowManyEqualOnesAreMissing) {
  write("a", kMost + 5);
  log.reset();
  EXPECT_EQ(written().back(), "equal lines left out: 5");
}

TEST_F(CondensingLogTest, SaysOnceASecondHowManyCameMeanwhile) {
  write("a", kMost + 2);
  clock.advance(CondensingLog::kCountPeriod);
  write("a");
  ASSERT_THAT(written(), SizeIs(kMost + 1));
  EXPECT_EQ(written().back(), "equal lines left out: 3");
  write("a", 7);
  EXPECT_THAT(written(), SizeIs(kMost + 1));
  clock.advance(CondensingLog::kCountPeriod);
  write("a");
  EXPECT_EQ(written().back(), "equal lines left out: 8");
}

TEST_F(CondensingLogTest, LosesNoLineFromTheCount) {
  write("a", kMost + 20);
  write("b", kMost + 30);
  log.reset();
  EXPECT_THAT(written(), IsSupersetOf({std::string("equal lines left out: 20"),
                                       std::string("equal lines left out: 30")}));
  EXPECT_THAT(written(), SizeIs(2 * kMost + 2));
}

TEST_F(CondensingLogTest, LinesOfAnotherCategoryOrLevelAreDifferent) {
  write("a", kMost);
  write("a", kMost, LogLevel::kError);
  write("a", kMost, LogLevel::kError, "twrs");
  EXPECT_THAT(written(), SizeIs(2 * kMost));
  EXPECT_THAT(written("twrs"), SizeIs(kMost));
}

TEST_F(CondensingLogTest, TheCountHasTheLevelOfItsLine) {
  write("a", kMost + 1, LogLevel::kError);
  log.reset();
  EXPECT_THAT(inner.textsOf("twri", LogLevel::kError), Contains("equal lines left out: 1"));
}

TEST_F(CondensingLogTest, AnEmptyFirstLineIsWritten) {
  write("");
  EXPECT_THAT(written(), ElementsAre(""));
}

TEST_F(CondensingLogTest, CountsTheLinesOfAllThreads) {
  constexpr int kLines = 1'000;
  std::vector<std::thread> threads;
  threads.reserve(3);
  for (int thread = 0; thread < 3; ++thread) {
    threads.emplace_back([this] { write("a", kLines); });
  }
  for (std::thread& thread : threads) thread.join();
  log.reset();
  EXPECT_EQ(written().back(), "equal lines left out: " + std::to_string(3 * kLines - kMost));
}

}  // namespace
}  // namespace tonewerk
