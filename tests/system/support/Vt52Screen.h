// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// What a terminal of the type vt52 shows after a program's output. That terminal has few controls, so a test
// can follow a program that writes only what changes on the screen.
class Vt52Screen {
 public:
  Vt52Screen(std::size_t columns, std::size_t rows);

  void write(std::string_view output);
  // Without the spaces at its end.
  std::string line(std::size_t row) const;
  // All lines, with a line feed behind each.
  std::string text() const;
  // Controls that a vt52 does not have; a program must not write them.
  const std::string& unknown() const { return unknown_; }

 private:
  std::size_t control(std::string_view output);
  void put(std::string character);
  void eraseFrom(std::size_t row, std::size_t column);
  void feedLine();

  const std::size_t columns_;
  std::vector<std::vector<std::string>> cells_;
  std::size_t row_ = 0;
  std::size_t column_ = 0;
  std::string unknown_;
};

}  // namespace tonewerk
