// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "tools/twctl/show/AudioHealth.h"
#include "tools/twctl/show/SessionRates.h"

namespace tonewerk {

struct TopColumn {
  std::string_view title;
  bool isNumber;
  // Columns with a higher number are left out first when the terminal is narrow; 0 is never left out.
  std::size_t expendability;
};

// What a column has of a row, as text and, for sorting, as a number (of a column of texts 0).
struct TopCell {
  std::string text;
  double number = 0.0;
};

// Rows of `twctl top`. All texts are printable.
struct TopCells {
  std::vector<TopColumn> columns;
  std::vector<std::vector<TopCell>> rows;
};

TopCells sessionCells(const std::vector<SessionRow>& rows);
TopCells nodeCells(const std::vector<NodeHealth>& nodes);

// "3 sessions, 12.3 messages a second, 2 overloads"; rates and overloads only where they are known.
std::string topSummary(const std::vector<SessionRow>& rows);

// "speaker: 34 % of the period, less than 50 % at worst, 2 xruns".
std::string deviceLine(const DeviceHealth& device);

}  // namespace tonewerk
