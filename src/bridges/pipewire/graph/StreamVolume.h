// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <vector>

namespace tonewerk {

// Holds the volume from a node's properties, as PipeWire gives it: linear factors.
struct StreamVolume {
  std::optional<bool> mute;
  std::optional<double> single;  // one factor for all channels; mixers use it only without `channels`
  std::vector<double> channels;  // one factor for each channel; mixers set these

  // Takes the values that `update` holds. An update holds only the values that changed.
  void merge(const StreamVolume& update);

  // Position of a mixer's slider, 0 to 1 in steps of 0.0001; none when no factor is known. Mixers show the
  // cube root of the factor. Of several channels they show the loudest, so that the balance does not move the
  // slider. A muted stream has 0, an amplified one 1.
  std::optional<double> shown() const;
};

}  // namespace tonewerk
