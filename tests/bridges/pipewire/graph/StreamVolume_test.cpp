// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/StreamVolume.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>

namespace tonewerk {
namespace {

StreamVolume withChannels(std::vector<double> channels) {
  StreamVolume volume;
  volume.channels = std::move(channels);
  return volume;
}

TEST(StreamVolume, IsUnknownWithoutAFactor) {
  EXPECT_EQ(StreamVolume().shown(), std::nullopt);
  StreamVolume muted;
  muted.mute = true;
  EXPECT_EQ(muted.shown(), std::nullopt);
}

TEST(StreamVolume, IsTheCubeRootThatMixersShow) {
  EXPECT_EQ(withChannels({1.0, 1.0}).shown(), 1.0);
  EXPECT_EQ(withChannels({0.125, 0.125}).shown(), 0.5);
  EXPECT_EQ(withChannels({0.0, 0.0}).shown(), 0.0);
}

TEST(StreamVolume, EqualsTheValueSetInSinglePrecision) {
  for (int percent = 0; percent <= 100; ++percent) {
    const float set = static_cast<float>(percent) / 100.0F;
    const double factor = static_cast<double>(set * set * set);
    EXPECT_EQ(withChannels({factor}).shown(), static_cast<double>(percent) / 100.0) << percent;
  }
}

TEST(StreamVolume, OfSeveralChannelsIsTheLoudest) {
  EXPECT_EQ(withChannels({0.0, 0.125, 0.027}).shown(), 0.5);
}

TEST(StreamVolume, StaysBetweenZeroAndOne) {
  EXPECT_EQ(withChannels({8.0}).shown(), 1.0);
  EXPECT_EQ(withChannels({-1.0}).shown(), 0.0);
  EXPECT_EQ(withChannels({std::numeric_limits<double>::quiet_NaN()}).shown(), 0.0);
  EXPECT_EQ(withChannels({std::numeric_limits<double>::infinity()}).shown(), 1.0);
}

TEST(StreamVolume, OfAMutedStreamIsZeroUntilItIsUnmuted) {
  StreamVolume volume = withChannels({0.125});
  StreamVolume update;
  update.mute = true;
  volume.merge(update);
  EXPECT_EQ(volume.shown(), 0.0);
  update.mute = false;
  volume.merge(update);
  EXPECT_EQ(volume.shown(), 0.5);
}

TEST(StreamVolume, UsesTheSingleFactorOnlyWithoutChannels) {
  StreamVolume volume;
  volume.single = 0.125;
  EXPECT_EQ(volume.shown(), 0.5);
  volume.merge(withChannels({1.0}));
  EXPECT_EQ(volume.shown(), 1.0);
}

}  // namespace
}  // namespace tonewerk
