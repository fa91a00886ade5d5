// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <vector>

namespace tonewerk {

// What a node's properties parameter says about its loudness, as PipeWire gives it: linear factors.
struct StreamVolume {
  std::optional<bool> mute;
  std::optional<double>
      single;  // one factor for all channels; mixers use it only where there is nothing else
  std::vector<double> channels;  // what mixers move

  // Takes from `update` what it holds: a change of one does not repeat the others.
  void merge(const StreamVolume& update);

  // Where a mixer's slider stands, 0 to 1 in steps of 0.0001; none when nothing is known. Mixers show cube
  // roots, and of several channels the loudest, so that the balance does not move the slider. Muted is 0,
  // amplified is 1.
  std::optional<double> shown() const;
};

}  // namespace tonewerk
