// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

struct Tool;

// Prints rows: in columns for people, or as one JSON object per line for programs. Escapes whatever a cell
// holds that could end the line or control the terminal (values/PrintableText.h).
class Table {
 public:
  // For the tool's output: lines fit the terminal, and have colours where the tool has them.
  Table(const Tool& tool, std::vector<std::string> columns);
  // `columns` are the headings of the columns and the keys of the objects.
  Table(std::ostream& out, bool asJson, std::vector<std::string> columns);
  Table(const Table&) = delete;
  Table& operator=(const Table&) = delete;
  // Prints the rows that are not printed yet.
  ~Table();

  // Makes lines for people take no more than `width` columns of the terminal, before the first row. Columns
  // that are too wide are cut, which "…" shows. Where they would have too little left, each row is
  // printed as a block of "column  value" with whole values, and an empty line follows it.
  void fit(std::size_t width) { width_ = width; }
  // Before lines are cut, leaves out columns until they fit: those of these names, from the first one on.
  // Call it before the first row. Objects for programs keep all columns.
  void dropWhenNarrow(const std::vector<std::string>& columns);

  enum class Style { kPlain, kError, kDim };
  struct Cell {
    std::string text;             // for people
    std::string json;             // for programs, a JSON value
    Style style = Style::kPlain;  // of the text, where there are colours
    bool isWhole = false;         // the cells of its column are not cut
    Cell(const Value& value);
    // Makes a cell of seconds since 1970: the local time for people (LocalTime.h), which is not cut, and the
    // number for programs.
    static Cell time(double seconds);
    Cell(std::string shown, std::string written) : text(std::move(shown)), json(std::move(written)) {}
    // The same cell in another style.
    Cell in(Style other) const;
  };
  // `cells` must have as many elements as there are columns.
  void add(std::vector<Cell> cells);

  // Prints the rows added so far. A column that was made wider by a row stays wide.
  void print();

 private:
  struct Text {
    std::string text;
    Style style = Style::kPlain;
  };
  using Row = std::vector<Text>;

  void dropColumns();
  // Prints the rows, and above the first one the head.
  void printRows(const std::vector<std::size_t>& widths);
  void printBlock(const Row& row);
  // The widths that fit; none when the columns would have too little left.
  std::optional<std::vector<std::size_t>> fittingWidths() const;
  std::vector<std::size_t> limited(std::size_t limit) const;
  // The length of a line with these widths, without the columns that are left out.
  std::size_t lengthOf(const std::vector<std::size_t>& widths) const;

  // Rows are printed in portions of this size, so that a long table needs little memory.
  static constexpr std::size_t kPortion = 500;
  static constexpr std::size_t kPortionBytes = std::size_t{1} << 20;
  // What a cut column keeps at least.
  static constexpr std::size_t kNarrowest = 8;

  std::ostream& out_;
  const bool asJson_;
  std::vector<std::string> columns_;
  std::vector<std::size_t> widths_;
  std::vector<Row> rows_;
  std::size_t rowBytes_ = 0;
  std::optional<std::size_t> width_;
  std::vector<std::size_t> toDrop_;  // places of columns, the first one to drop first
  std::vector<bool> isDropped_;      // by column
  std::vector<bool> isWhole_;        // by column
  bool hasColour_ = false;
  bool headPrinted_ = false;
  bool inBlocks_ = false;
};

}  // namespace tonewerk
