// SPDX-License-Identifier: Apache-2.0
#include "system/support/Vt52Screen.h"

#include <algorithm>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr char kEscape = '\x1b';
constexpr std::size_t kFirstPlace = 32;  // ' ' stands for row or column 0

}  // namespace

Vt52Screen::Vt52Screen(std::size_t columns, std::size_t rows)
    : columns_(columns), cells_(rows, std::vector<std::string>(columns, " ")) {}

void Vt52Screen::write(std::string_view output) {
  while (!output.empty()) {
    std::size_t length = 1;
    const char first = output.front();
    if (first == kEscape) {
      length = control(output);
    } else if (first == '\n') {
      feedLine();
    } else if (first == '\r') {
      column_ = 0;
    } else if (first == '\b') {
      column_ -= std::min<std::size_t>(column_, 1);
    } else if (first == '\t') {
      column_ = std::min(columns_ - 1, (column_ / 8 + 1) * 8);
    } else if (static_cast<unsigned char>(first) >= ' ') {
      length = std::max<std::size_t>(1, utf8CharacterLength(output));
      put(std::string(output.substr(0, length)));
    }
    output.remove_prefix(std::min(length, output.size()));
  }
}

std::string Vt52Screen::line(std::size_t row) const {
  std::string text;
  for (const std::string& cell : cells_.at(row)) text += cell;
  return text.substr(0, text.find_last_not_of(' ') + 1);
}

std::string Vt52Screen::text() const {
  std::string all;
  for (std::size_t row = 0; row < cells_.size(); ++row) all += line(row) + "\n";
  return all;
}

// Returns the length of the control at the start of `output`.
std::size_t Vt52Screen::control(std::string_view output) {
  if (output.size() < 2) return output.size();
  switch (output[1]) {
    case 'A':
      row_ -= std::min<std::size_t>(row_, 1);
      return 2;
    case 'B':
      row_ = std::min(row_ + 1, cells_.size() - 1);
      return 2;
    case 'C':
      column_ = std::min(column_ + 1, columns_ - 1);
      return 2;
    case 'D':
      column_ -= std::min<std::size_t>(column_, 1);
      return 2;
    case 'H':
      row_ = column_ = 0;
      return 2;
    case 'I':
      if (row_ > 0) {
        --row_;
      } else {
        cells_.insert(cells_.begin(), std::vector<std::string>(columns_, " "));
        cells_.pop_back();
      }
      return 2;
    case 'J':
      eraseFrom(row_, column_);
      for (std::size_t row = row_ + 1; row < cells_.size(); ++row) eraseFrom(row, 0);
      return 2;
    case 'K':
      eraseFrom(row_, column_);
      return 2;
    case 'Y':
      if (output.size() < 4) return output.size();
      row_ = std::min(static_cast<unsigned char>(output[2]) - kFirstPlace, cells_.size() - 1);
      column_ = std::min(static_cast<unsigned char>(output[3]) - kFirstPlace, columns_ - 1);
      return 4;
    case '=':
    case '>':
    case 'F':
    case 'G':
      return 2;
    default:
      unknown_ += output[1];
      return 2;
  }
}

void Vt52Screen::put(std::string character) {
  cells_[row_][column_] = std::move(character);
  column_ = std::min(column_ + 1, columns_ - 1);
}

void Vt52Screen::eraseFrom(std::size_t row, std::size_t column) {
  std::fill(cells_[row].begin() + static_cast<std::ptrdiff_t>(column), cells_[row].end(), " ");
}

void Vt52Screen::feedLine() {
  if (row_ + 1 < cells_.size()) {
    ++row_;
    return;
  }
  cells_.erase(cells_.begin());
  cells_.emplace_back(columns_, " ");
}

}  // namespace tonewerk
