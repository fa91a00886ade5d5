// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstdint>

namespace tonewerk {

// A stream's sound was not ready in time, or its device ran dry; of several in a row the last.
struct Overload {
  double time = 0;           // seconds since 1970
  std::uint32_t frames = 0;  // of the smallest of the cycles
  std::uint64_t cycle = 0;   // the driver's cycle
  std::uint32_t xruns = 0;   // how many

  void add(const Overload& later) {
    time = later.time;
    frames = std::min(frames, later.frames);
    cycle = later.cycle;
    xruns += later.xruns;
  }

  friend bool operator==(const Overload&, const Overload&) = default;
};

}  // namespace tonewerk
