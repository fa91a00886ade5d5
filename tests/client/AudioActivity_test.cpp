// SPDX-License-Identifier: Apache-2.0
#include "client/AudioActivity.h"

#include <atomic>
#include <chrono>
#include <gmock/gmock.h>
#include <thread>

namespace tonewerk {
namespace {

using namespace std::chrono_literals;

TEST(AudioActivityTest, KnowsForHowLongItHasRun) {
  AudioActivity activity;
  EXPECT_TRUE(activity.begin(AudioActivity::kPlaying, 1'000'000us));
  const AudioActivity::End end = activity.end(AudioActivity::kPlaying, 3'500'001us);
  EXPECT_TRUE(end.wasRunning);
  EXPECT_DOUBLE_EQ(end.seconds.value_or(-1.0), 2.500001);
}

TEST(AudioActivityTest, BeginsOnlyOnce) {
  AudioActivity activity;
  EXPECT_TRUE(activity.begin(AudioActivity::kRecording, 1s));
  EXPECT_FALSE(activity.begin(AudioActivity::kRecording, 2s));
  const AudioActivity::End end = activity.end(AudioActivity::kRecording, 5s);
  EXPECT_TRUE(end.wasRunning);
  EXPECT_EQ(end.seconds, 4.0);
  EXPECT_FALSE(activity.end(AudioActivity::kRecording, 6s).wasRunning);
}

TEST(AudioActivityTest, EndsWithTheLastOfTwo) {
  AudioActivity activity;
  activity.begin(AudioActivity::kPlaying, 1s);
  activity.begin(AudioActivity::kRecording, 3s);
  const AudioActivity::End first = activity.end(AudioActivity::kPlaying, 4s);
  EXPECT_TRUE(first.wasRunning);
  EXPECT_FALSE(first.seconds);
  EXPECT_EQ(activity.end(AudioActivity::kRecording, 6s).seconds, 5.0);  // since the beginning of the first
  // After a pause it is another activity.
  activity.begin(AudioActivity::kRecording, 10s);
  EXPECT_EQ(activity.end(AudioActivity::kRecording, 11s).seconds, 1.0);
}

TEST(AudioActivityTest, GoesOnWhenItsEndIsTakenBack) {
  AudioActivity activity;
  activity.begin(AudioActivity::kPlaying, 1s);
  activity.resume(AudioActivity::kPlaying, activity.end(AudioActivity::kPlaying, 2s));
  EXPECT_EQ(activity.end(AudioActivity::kPlaying, 3s).seconds, 2.0);
}

TEST(AudioActivityTest, HasNoLengthBelowZero) {
  AudioActivity activity;
  activity.begin(AudioActivity::kPlaying, 2s);
  EXPECT_EQ(activity.end(AudioActivity::kPlaying, 1s).seconds, 0.0);
}

// Each thread begins and ends its own kind, at the times 0 and 1. Whoever is the last to end has the time.
TEST(AudioActivityTest, IsTheSameForTwoThreads) {
  AudioActivity activity;
  std::atomic<int> lost{0};
  const auto run = [&](AudioActivity::Kind kind) {
    for (int times = 0; times < 20'000; ++times) {
      if (!activity.begin(kind, 0s)) ++lost;
      const AudioActivity::End end = activity.end(kind, 1s);
      if (!end.wasRunning || end.seconds.value_or(1.0) != 1.0) ++lost;
    }
  };
  std::thread player(run, AudioActivity::kPlaying);
  std::thread recorder(run, AudioActivity::kRecording);
  player.join();
  recorder.join();
  EXPECT_EQ(lost, 0);
  EXPECT_FALSE(activity.end(AudioActivity::kPlaying, 2s).wasRunning);
  EXPECT_FALSE(activity.end(AudioActivity::kRecording, 2s).wasRunning);
}

}  // namespace
}  // namespace tonewerk
