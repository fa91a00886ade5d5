// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/StreamVolume.h"

#include <algorithm>
#include <cmath>

namespace tonewerk {

namespace {

// Factors have single precision: 0.3 set in a mixer comes back as 0.30000001. Rounding restores the value
// that was set, and a difference in the last bits is then not a change of volume.
constexpr double kSteps = 10'000.0;

double sliderOf(double factor) {
  if (!(factor > 0.0)) return 0.0;  // NaN too
  return std::round(std::min(1.0, std::cbrt(factor)) * kSteps) / kSteps;
}

}  // namespace

void StreamVolume::merge(const StreamVolume& update) {
  if (update.mute) mute = update.mute;
  if (update.single) single = update.single;
  if (!update.channels.empty()) channels = update.channels;
}

std::optional<double> StreamVolume::shown() const {
  if (channels.empty() && !single) return std::nullopt;
  if (mute.value_or(false)) return 0.0;
  if (channels.empty()) return sliderOf(*single);
  double loudest = 0.0;
  for (const double channel : channels) loudest = std::max(loudest, sliderOf(channel));
  return loudest;
}

}  // namespace tonewerk
