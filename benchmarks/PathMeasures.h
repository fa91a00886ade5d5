// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

// How many messages a measure sends, compared with a whole run.
struct PathEffort {
  std::size_t divisor = 1;
  std::size_t of(std::size_t messages) const { return messages / divisor; }
};

// One row of the table about the way of a message: what is measured, and what it should be.
//
// Each function runs its server once. It throws std::runtime_error when work is missing.
struct PathMeasure {
  std::string key;   // for programs
  std::string what;  // for people
  std::string unit;
  double aim = 0.0;  // 0: none, only for comparison
  // Measures a daemon.
  std::function<double(const std::string& daemon)> measure;
  // Measures what the daemon is compared with. The row has the ratio then.
  std::function<double()> reference;
  bool isMoreBetter = false;  // then the aim is the least, else the most
  std::string problem = {};   // why this machine cannot measure it; usually empty
};

// `floor` is the path of the floor's server.
std::vector<PathMeasure> pathMeasures(const PathEffort& effort, const std::string& floor);

}  // namespace tonewerk
