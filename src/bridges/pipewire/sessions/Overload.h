// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>

#include "values/ValueMap.h"

namespace tonewerk {

// What is known of whose overload it was. Without a key, nothing is.
struct OverloadVerdict {
  std::string key{};  // equal for overloads of the same culprit and cause
  double overMilliseconds = 0;
  double lostMilliseconds = 0;
  ValueMap values{};  // the other keys of the message

  friend bool operator==(const OverloadVerdict&, const OverloadVerdict&) = default;
};

// A stream's data was not ready in time, or its device ran out of data. Several in a row are added up: the
// time and the cycle are then those of the latest, the verdict that of the longest.
struct Overload {
  double time = 0;           // seconds since 1970
  std::uint32_t frames = 0;  // length of the shortest of the cycles
  std::uint64_t cycle = 0;   // number of the driver's cycle
  std::uint32_t xruns = 0;   // number of xruns
  OverloadVerdict verdict{};

  void add(const Overload& later) {
    time = later.time;
    frames = std::min(frames, later.frames);
    cycle = later.cycle;
    xruns += later.xruns;
    if (later.verdict.key.empty()) return;
    const double lost = verdict.lostMilliseconds + later.verdict.lostMilliseconds;
    if (verdict.key.empty() || later.verdict.overMilliseconds > verdict.overMilliseconds) {
      verdict = later.verdict;
    }
    verdict.lostMilliseconds = lost;
  }

  friend bool operator==(const Overload&, const Overload&) = default;
};

}  // namespace tonewerk
