// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstdint>

namespace tonewerk {

// A stream's data was not ready in time, or its device ran out of data. Several in a row are added up: the
// time and the cycle are then those of the latest.
struct Overload {
  double time = 0;           // seconds since 1970
  std::uint32_t frames = 0;  // length of the shortest of the cycles
  std::uint64_t cycle = 0;   // number of the driver's cycle
  std::uint32_t xruns = 0;   // number of xruns

  void add(const Overload& later) {
    time = later.time;
    frames = std::min(frames, later.frames);
    cycle = later.cycle;
    xruns += later.xruns;
  }

  friend bool operator==(const Overload&, const Overload&) = default;
};

}  // namespace tonewerk
