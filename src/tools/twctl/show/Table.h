// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Prints rows: in columns for people, or as one JSON object per line for programs. Escapes whatever a cell
// holds that could end the line or control the terminal (values/PrintableText.h).
class Table {
 public:
  // `columns` are the headings of the columns and the keys of the objects.
  Table(std::ostream& out, bool asJson, std::vector<std::string> columns);
  Table(const Table&) = delete;
  Table& operator=(const Table&) = delete;
  // Prints the rows that are not printed yet.
  ~Table();

  struct Cell {
    std::string text;  // for people
    std::string json;  // for programs, a JSON value
    Cell(const Value& value);
    // Makes a cell of seconds since 1970: RFC 3339 for people, the number for programs.
    static Cell time(double seconds);
    Cell(std::string shown, std::string written) : text(std::move(shown)), json(std::move(written)) {}
  };
  // `cells` must have as many elements as there are columns.
  void add(std::vector<Cell> cells);

  // Prints the rows added so far. A column that was made wider by a row stays wide.
  void print();

 private:
  void printRow(const std::vector<std::string>& texts);

  // Rows are printed in portions of this size, so that a long table needs little memory.
  static constexpr std::size_t kPortion = 500;

  std::ostream& out_;
  const bool asJson_;
  const std::vector<std::string> columns_;
  std::vector<std::size_t> widths_;
  std::vector<std::vector<std::string>> rows_;
  bool headPrinted_ = false;
};

}  // namespace tonewerk
