// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/PcmStatus.h"

#include <gtest/gtest.h>
#include <string>

namespace tonewerk {
namespace {

std::string statusWith(const std::string& state, const std::string& triggered, const std::string& now,
                       const std::string& position = "1336652") {
  return "state: " + state + "\nowner_pid   : 2317\ntrigger_time: " + triggered + "\ntstamp      : " + now +
         "\ndelay       : 3540\navail       : 61996\navail_max   : 62446\n-----\nhw_ptr      : " + position +
         "\nappl_ptr    : 1340192\n";
}

constexpr char kParameters[] =
    "access: MMAP_INTERLEAVED\nformat: S32_LE\nsubformat: STD\nchannels: 2\nrate: 48000 (48000/1)\n"
    "period_size: 1024\nbuffer_size: 65536\n";

std::uint64_t millisecondsOf(const std::string& status, const std::string& parameters = kParameters) {
  const auto parsed = PcmStatus::parse(status, parameters);
  EXPECT_TRUE(parsed);
  return parsed ? parsed->stateMilliseconds : 0;
}

TEST(PcmStatusTest, ReadsARunningSubstream) {
  const auto status =
      PcmStatus::parse(statusWith("RUNNING", "20431.373104146", "20459.218446026"), kParameters);
  ASSERT_TRUE(status);
  EXPECT_EQ(status->state, "RUNNING");
  EXPECT_EQ(status->hardwarePosition, 1336652);
  EXPECT_EQ(status->delay, 3540);
  EXPECT_EQ(status->stateMilliseconds, 27845U);
}

TEST(PcmStatusTest, ReadsAClosedSubstream) {
  const auto status = PcmStatus::parse("closed\n", "closed\n");
  ASSERT_TRUE(status);
  EXPECT_EQ(status->state, "closed");
  EXPECT_EQ(status->hardwarePosition, 0);
  EXPECT_EQ(status->delay, 0);
  EXPECT_EQ(status->stateMilliseconds, 0U);
}

TEST(PcmStatusTest, ReadsANegativeDelay) {
  const auto status = PcmStatus::parse("state: XRUN\ndelay       : -12\nhw_ptr      : 9\n", kParameters);
  ASSERT_TRUE(status);
  EXPECT_EQ(status->delay, -12);
}

TEST(PcmStatusTest, TakesTimesOfFewAndOfManyDigits) {
  EXPECT_EQ(millisecondsOf(statusWith("PAUSED", "10.5", "12.000001")), 1500U);
  EXPECT_EQ(millisecondsOf(statusWith("PAUSED", "10", "12.25")), 2250U);
}

TEST(PcmStatusTest, GivesZeroIfTheClockWentBack) {
  EXPECT_EQ(millisecondsOf(statusWith("RUNNING", "30.0", "20.0")), 0U);
}

TEST(PcmStatusTest, UsesThePositionWithoutTimeStamps) {
  EXPECT_EQ(millisecondsOf(statusWith("RUNNING", "20431.373104146", "0.000000000", "72000")), 1500U);
  EXPECT_EQ(millisecondsOf(statusWith("DRAINING", "20431.373104146", "0.000000000", "72000")), 0U);
  EXPECT_EQ(millisecondsOf(statusWith("RUNNING", "1.0", "0.0", "72000"), "closed\n"), 0U);
  EXPECT_EQ(millisecondsOf(statusWith("RUNNING", "1.0", "0.0", "72000"), "rate: 0\n"), 0U);
  EXPECT_EQ(millisecondsOf(statusWith("RUNNING", "1.0", "0.0", "-72000")), 0U);
}

TEST(PcmStatusTest, IgnoresTimesOutOfRange) {
  EXPECT_EQ(millisecondsOf(statusWith("PAUSED", "1.0", "9223372036854775807.9")), 0U);
  EXPECT_EQ(millisecondsOf(statusWith("PAUSED", "-5.0", "x")), 0U);
  EXPECT_GT(millisecondsOf(statusWith("RUNNING", "0.0", "0.0", "9223372036854775807")), 0U);
}

TEST(PcmStatusTest, RefusesOtherForms) {
  for (const char* text : {"", "\n", "open", "state: RUNNING\n", "state: RUNNING\nhw_ptr : 1\n",
                           "state: \nhw_ptr : 1\ndelay : 1\n", "hw_ptr : 1\ndelay : 1\n",
                           "state: RUNNING\nhw_ptr : 9223372036854775808\ndelay : 1\n",
                           "state: RUNNING\nhw_ptr : \ndelay : 1\n"}) {
    EXPECT_FALSE(PcmStatus::parse(text, kParameters)) << text;
  }
}

}  // namespace
}  // namespace tonewerk
