// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// Rows for people, in columns, or for programs, as one JSON object a line.
class Table {
 public:
  // `columns` are the heads of the columns and the keys of the objects.
  Table(std::ostream& out, bool asJson, std::vector<std::string> columns);
  Table(const Table&) = delete;
  Table& operator=(const Table&) = delete;
  // Prints what is left.
  ~Table();

  struct Cell {
    std::string text;  // for people
    std::string json;  // for programs, a JSON value
    Cell(const Value& value);
    // Seconds since 1970: RFC 3339 for people, the number for programs.
    static Cell time(double seconds);
    Cell(std::string shown, std::string written) : text(std::move(shown)), json(std::move(written)) {}
  };
  // As many cells as columns.
  void add(std::vector<Cell> cells);

  // Prints the rows added so far. Columns that a row makes wider stay so.
  void print();

 private:
  void printRow(const std::vector<std::string>& texts);

  // Rows are printed in portions, so that a long table needs no more memory than these.
  static constexpr std::size_t kPortion = 500;

  std::ostream& out_;
  const bool asJson_;
  const std::vector<std::string> columns_;
  std::vector<std::size_t> widths_;
  std::vector<std::vector<std::string>> rows_;
  bool headPrinted_ = false;
};

}  // namespace tonewerk
