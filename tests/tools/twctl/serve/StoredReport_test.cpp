// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/StoredReport.h"

#include <atomic>
#include <gmock/gmock.h>
#include <thread>

#include "values/Value.h"

namespace tonewerk {
namespace {

class StoredReportTest : public testing::Test {
 protected:
  // Waits until the newest reading fits.
  template <typename Condition>
  void waitUntil(Condition condition) {
    while (!condition(*report_.newest())) {
      report_.refresh();
      std::this_thread::yield();
    }
  }

  std::atomic<int> content_ = 1;
  std::atomic<int> readings_ = 0;
  std::atomic<bool> isBroken_ = false;
  std::atomic<bool> isEndless_ = false;
  StoredReport report_{{[this](const std::stop_token& stop) {
                          ++readings_;
                          while (isEndless_ && !stop.stop_requested()) std::this_thread::yield();
                          StoredReport::Reading reading;
                          if (isBroken_) {
                            reading.problem = "broken";
                          } else {
                            reading.data.set("content", content_.load());
                          }
                          return reading;
                        },
                        [this] { return std::to_string(content_); }}};
};

TEST_F(StoredReportTest, ReadsAgainOnlyWhatHasChanged) {
  EXPECT_EQ(report_.readFirst(), "");
  EXPECT_EQ(report_.newest()->number, 1U);
  report_.start();
  content_ = 2;
  waitUntil([](const StoredReport::Reading& newest) { return newest.number == 2; });
  EXPECT_EQ(report_.newest()->data.integer("content"), 2);
  EXPECT_EQ(readings_, 2);
}

TEST_F(StoredReportTest, KeepsWhatItHasWhenAReadingFailsAndTriesAgain) {
  EXPECT_EQ(report_.readFirst(), "");
  report_.start();
  isBroken_ = true;
  content_ = 2;
  waitUntil([](const StoredReport::Reading& newest) { return !newest.problem.empty(); });
  EXPECT_EQ(report_.newest()->data.integer("content"), 1);
  EXPECT_EQ(report_.newest()->number, 1U);
  isBroken_ = false;
  waitUntil([](const StoredReport::Reading& newest) { return newest.number == 2; });
  EXPECT_EQ(report_.newest()->data.integer("content"), 2);
  EXPECT_EQ(report_.newest()->problem, "");
}

TEST_F(StoredReportTest, ForgetsAProblemWhenTheFilesAreBackAsTheyWere) {
  EXPECT_EQ(report_.readFirst(), "");
  report_.start();
  isBroken_ = true;
  content_ = 2;
  waitUntil([](const StoredReport::Reading& newest) { return !newest.problem.empty(); });
  content_ = 1;
  isBroken_ = false;
  waitUntil([](const StoredReport::Reading& newest) { return newest.problem.empty(); });
  EXPECT_EQ(report_.newest()->data.integer("content"), 1);
}

TEST_F(StoredReportTest, SaysWhyItCannotBeReadAtFirst) {
  isBroken_ = true;
  EXPECT_EQ(report_.readFirst(), "broken");
}

// Its end is the end of the test.
TEST_F(StoredReportTest, DoesNotWaitForAReadingAtItsEnd) {
  EXPECT_EQ(report_.readFirst(), "");
  report_.start();
  isEndless_ = true;
  content_ = 2;
  report_.refresh();
  while (readings_ < 2) std::this_thread::yield();
}

}  // namespace
}  // namespace tonewerk
