// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

namespace tonewerk {

// Holds one measured figure, of all rounds: one number for each.
struct PathFigure {
  std::string key;
  std::string what;
  std::string unit;
  double aim = 0.0;           // 0: none
  bool isMoreBetter = false;  // then the aim is the least, else the most
  std::string problem = {};   // why it was not measured; usually empty
  std::vector<double> now = {};
  std::vector<double> before = {};  // empty without a daemon to compare with
  // What the daemons are compared with. When it is not empty, the figure is the ratio to it, round by round.
  std::vector<double> reference = {};
};

// Returns the middle number; 0 without numbers.
double medianOf(std::vector<double> numbers);

// Prints for each figure the medians of what was measured, and their range.
void printDetails(const std::vector<PathFigure>& figures);

// Appends a line for each figure to the file, which scripts/benchmark prints as a table: key, text, now,
// before, aim and unit, separated by tabs. What is missing is "-". An aim is "<=1.5" or ">=6". False on
// failure.
[[nodiscard]] bool appendFigures(const std::vector<PathFigure>& figures, const std::string& path);

}  // namespace tonewerk
