// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/kernel/KernelTexts.h"

#include <gtest/gtest.h>
#include <string>

#include "bridges/pipewire/kernel/KernelFile.h"

namespace tonewerk {
namespace {

using std::chrono::microseconds;
using std::chrono::nanoseconds;

// As Linux 6.1 writes it.
constexpr const char* kStat =
    "8 (data-loop.0) S 1 7 7 0 -1 1077936192 120 0 4 0 12 5 0 0 -21 0 3 0 34455 270000128 2961 "
    "18446744073709551615 1 1 0 0 0 0 0 4096 81920 0 0 0 -1 3 20 2 0 0 0 0 0 0 0 0 0 0 0\n";

TEST(KernelTextsTest, ReadsAThread) {
  const auto stat = threadStatIn(kStat);
  ASSERT_TRUE(stat);
  EXPECT_EQ(stat->name.view(), "data-loop.0");
  EXPECT_EQ(stat->state, 'S');
  EXPECT_FALSE(stat->isOfKernel);
  EXPECT_EQ(stat->majorFaults, 4u);
  EXPECT_EQ(stat->processor, 3);
  EXPECT_EQ(stat->priority, 20);
  EXPECT_EQ(stat->policy, 2);
}

TEST(KernelTextsTest, ReadsAThreadWhoseNameHoldsBracketsAndSpaces) {
  std::string text = kStat;
  text.replace(text.find("data-loop.0"), 11, ") R 1 (x) (");
  const auto stat = threadStatIn(text);
  ASSERT_TRUE(stat);
  EXPECT_EQ(stat->name.view(), ") R 1 (x) (");
  EXPECT_EQ(stat->state, 'S');
  EXPECT_EQ(stat->policy, 2);
}

TEST(KernelTextsTest, ReadsNoThreadFromATextThatIsCutOff) {
  const std::string text = kStat;
  EXPECT_FALSE(threadStatIn(""));
  EXPECT_FALSE(threadStatIn(text.substr(0, 10)));
  EXPECT_FALSE(threadStatIn(text.substr(0, text.find(" 20 2 "))));
  EXPECT_FALSE(threadStatIn(")("));
}

TEST(KernelTextsTest, ReadsTimesOfAThread) {
  const auto times = threadTimesIn("123456789 987 42\n");
  ASSERT_TRUE(times);
  EXPECT_EQ(times->ran, nanoseconds(123456789));
  EXPECT_EQ(times->waited, nanoseconds(987));
  EXPECT_FALSE(threadTimesIn("123456789"));
  EXPECT_FALSE(threadTimesIn("-1 2 3"));
  EXPECT_FALSE(threadTimesIn("18446744073709551615 2 3"));
}

TEST(KernelTextsTest, ReadsThePressureOfSomeProcesses) {
  const std::string text =
      "some avg10=1.00 avg60=0.50 avg300=0.10 total=7654321\nfull avg10=0.00 avg60=0.00 avg300=0.00 "
      "total=1\n";
  EXPECT_EQ(pressureIn(text), nanoseconds(microseconds(7654321)));
  EXPECT_FALSE(pressureIn("some avg10=1.00"));
  EXPECT_FALSE(pressureIn("full avg10=0.00 total=1\n"));
  EXPECT_FALSE(pressureIn("some total=18446744073709551615\n"));
}

TEST(KernelTextsTest, CutsANameAtTheEndOfTheLineAndAtItsLimit) {
  EXPECT_EQ(nameIn("pipewire\n").view(), "pipewire");
  EXPECT_EQ(nameIn("a-name-that-is-too-long").view(), "a-name-that-is-");
}

TEST(KernelTextsTest, TakesOnlyWholeNumbersOfNames) {
  EXPECT_EQ(numberAfter("card12", "card"), 12);
  EXPECT_EQ(numberAfter("12", ""), 12);
  EXPECT_EQ(numberAfter("cards", "card"), -1);
  EXPECT_EQ(numberAfter("card", "card"), -1);
  EXPECT_EQ(numberAfter("card-1", "card"), -1);
  EXPECT_EQ(numberAfter("card99999999999", "card"), -1);
}

TEST(KernelPathTest, IsEmptyWhenItGetsTooLong) {
  EXPECT_STREQ((KernelPath("/proc") / 12 / "stat").text(), "/proc/12/stat");
  const KernelPath tooLong = KernelPath(std::string(300, 'x')) / "stat";
  EXPECT_STREQ(tooLong.text(), "");
  EXPECT_FALSE(KernelFile(tooLong));
}

}  // namespace
}  // namespace tonewerk
