// SPDX-License-Identifier: Apache-2.0
#include "client/AudioActivity.h"

#include <atomic>
#include <ctime>
#include <gmock/gmock.h>
#include <thread>

namespace tonewerk {
namespace {

double coarseMonotonic() {
  timespec now{};
  ::clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

constexpr double kMicrosecond = 2e-6;

TEST(AudioActivityTest, KnowsForHowLongItHasRun) {
  AudioActivity activity;
  const double before = coarseMonotonic();
  EXPECT_TRUE(activity.begin(AudioActivity::kPlaying));
  const double begun = coarseMonotonic();
  while (coarseMonotonic() < begun + 0.02) {
  }
  const AudioActivity::End end = activity.end(AudioActivity::kPlaying);
  const double after = coarseMonotonic();
  ASSERT_TRUE(end.wasRunning && end.seconds);
  EXPECT_GE(*end.seconds, 0.02 - kMicrosecond);
  EXPECT_LE(*end.seconds, after - before + kMicrosecond);
}

TEST(AudioActivityTest, BeginsOnlyOnce) {
  AudioActivity activity;
  EXPECT_TRUE(activity.begin(AudioActivity::kRecording));
  EXPECT_FALSE(activity.begin(AudioActivity::kRecording));
  EXPECT_TRUE(activity.end(AudioActivity::kRecording).wasRunning);
  EXPECT_FALSE(activity.end(AudioActivity::kRecording).wasRunning);
}

TEST(AudioActivityTest, EndsWithTheLastOfTwo) {
  AudioActivity activity;
  activity.begin(AudioActivity::kPlaying);
  const double begun = coarseMonotonic();
  while (coarseMonotonic() < begun + 0.02) {
  }
  activity.begin(AudioActivity::kRecording);
  const AudioActivity::End first = activity.end(AudioActivity::kPlaying);
  EXPECT_TRUE(first.wasRunning);
  EXPECT_FALSE(first.seconds);
  const AudioActivity::End last = activity.end(AudioActivity::kRecording);
  ASSERT_TRUE(last.seconds);
  EXPECT_GE(*last.seconds, 0.02 - kMicrosecond);  // since the beginning of the first
}

TEST(AudioActivityTest, GoesOnWhenItsEndIsTakenBack) {
  AudioActivity activity;
  activity.begin(AudioActivity::kPlaying);
  const double begun = coarseMonotonic();
  while (coarseMonotonic() < begun + 0.02) {
  }
  activity.resume(AudioActivity::kPlaying, activity.end(AudioActivity::kPlaying));
  const AudioActivity::End end = activity.end(AudioActivity::kPlaying);
  ASSERT_TRUE(end.seconds);
  EXPECT_GE(*end.seconds, 0.02 - kMicrosecond);
}

// Each thread begins and ends its own kind. Whoever is the last to end has the time of both.
TEST(AudioActivityTest, IsTheSameForTwoThreads) {
  AudioActivity activity;
  const double before = coarseMonotonic();
  std::atomic<double> longest{0};
  std::atomic<int> lost{0};
  const auto run = [&](AudioActivity::Kind kind) {
    for (int times = 0; times < 20'000; ++times) {
      if (!activity.begin(kind)) ++lost;
      const AudioActivity::End end = activity.end(kind);
      if (!end.wasRunning) ++lost;
      double seen = longest.load();
      while (end.seconds && *end.seconds > seen && !longest.compare_exchange_weak(seen, *end.seconds)) {
      }
    }
  };
  std::thread player(run, AudioActivity::kPlaying);
  std::thread recorder(run, AudioActivity::kRecording);
  player.join();
  recorder.join();
  EXPECT_EQ(lost, 0);
  EXPECT_LE(longest, coarseMonotonic() - before + kMicrosecond);
  EXPECT_FALSE(activity.end(AudioActivity::kPlaying).wasRunning);
  EXPECT_FALSE(activity.end(AudioActivity::kRecording).wasRunning);
}

}  // namespace
}  // namespace tonewerk
