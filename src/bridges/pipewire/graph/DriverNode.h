// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <tuple>

namespace tonewerk {

// Identifies a sink or source that drives other nodes: its clock starts their cycles. Two nodes of the same
// direction and name count as one driver, so a device that is plugged in again continues its statistics.
struct DriverNode {
  enum Direction { kSink, kSource };

  Direction direction = kSink;
  std::string name;

  friend bool operator==(const DriverNode&, const DriverNode&) = default;
  friend bool operator<(const DriverNode& a, const DriverNode& b) {
    return std::tie(a.direction, a.name) < std::tie(b.direction, b.name);
  }
};

}  // namespace tonewerk
