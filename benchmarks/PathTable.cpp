// SPDX-License-Identifier: Apache-2.0
#include "PathTable.h"

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <fstream>

namespace tonewerk {
namespace {

constexpr const char* kNone = "-";

std::string textOf(double number) {
  char text[32];
  std::snprintf(text, sizeof(text), "%.4g", number);
  return text;
}

// The loads of two rounds differ, those within a round hardly.
std::string figureOf(const std::vector<double>& measured, const std::vector<double>& reference) {
  if (measured.empty()) return kNone;
  if (reference.empty()) return textOf(medianOf(measured));
  std::vector<double> ratios;
  const std::size_t rounds = std::min(measured.size(), reference.size());
  for (std::size_t round = 0; round < rounds; ++round) ratios.push_back(measured[round] / reference[round]);
  return textOf(medianOf(ratios));
}

void printRange(const char* name, const std::vector<double>& numbers) {
  if (numbers.empty()) return;
  const auto [least, most] = std::minmax_element(numbers.begin(), numbers.end());
  std::printf("  %s %.4g (%.4g to %.4g)", name, medianOf(numbers), *least, *most);
}

}  // namespace

double medianOf(std::vector<double> numbers) {
  if (numbers.empty()) return 0.0;
  const auto middle = numbers.begin() + static_cast<std::ptrdiff_t>(numbers.size() / 2);
  std::nth_element(numbers.begin(), middle, numbers.end());
  return *middle;
}

void printDetails(const std::vector<PathFigure>& figures) {
  std::printf("\nThe way of a message: medians of what was measured, and their range\n\n");
  for (const PathFigure& figure : figures) {
    std::printf("%-54s", figure.what.c_str());
    if (!figure.problem.empty()) std::printf("  not measured: %s", figure.problem.c_str());
    printRange("now", figure.now);
    printRange("before", figure.before);
    printRange("beside", figure.reference);
    std::printf("  %s\n", figure.unit.c_str());
  }
}

bool appendFigures(const std::vector<PathFigure>& figures, const std::string& path) {
  std::ofstream file(path, std::ios::app);
  for (const PathFigure& figure : figures) {
    const std::string aim = (figure.isMoreBetter ? ">=" : "<=") + textOf(figure.aim);
    const std::string note = figure.problem.empty() ? "" : " (not measured: " + figure.problem + ")";
    file << figure.key << '\t' << figure.what << note << '\t' << figureOf(figure.now, figure.reference)
         << '\t' << figureOf(figure.before, figure.reference) << '\t' << (figure.aim == 0.0 ? kNone : aim)
         << '\t' << (figure.unit.empty() ? kNone : figure.unit) << '\n';
  }
  return static_cast<bool>(file.flush());
}

}  // namespace tonewerk
