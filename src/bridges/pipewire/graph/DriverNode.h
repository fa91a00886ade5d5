// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <tuple>

namespace tonewerk {

// A sink or source that gives the nodes it serves their rhythm. Two of one direction and name are taken for
// one, so that a device that is plugged in again goes on where it was.
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
