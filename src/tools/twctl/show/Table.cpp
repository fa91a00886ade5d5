// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Table.h"

#include <algorithm>
#include <cstdlib>
#include <libsmartcols/libsmartcols.h>
#include <memory>
#include <new>
#include <ostream>
#include <utility>

#include "tools/twctl/Tool.h"
#include "tools/twctl/show/Colours.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/Terminal.h"
#include "tools/twctl/show/TextWidth.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr std::size_t kGap = 2;  // spaces between columns

std::string jsonOf(const Value& value) {
  std::string json;
  appendCompactJson(json, value);
  return json;
}

const char* sequenceOf(Table::Style style) {
  switch (style) {
    case Table::Style::kError:
      return colours::kRed;
    case Table::Style::kDim:
      return colours::kDim;
    case Table::Style::kPlain:
      break;
  }
  return nullptr;
}

struct FreeTable {
  void operator()(libscols_table* table) const { scols_unref_table(table); }
};
struct FreeText {
  void operator()(char* text) const { std::free(text); }
};

// The library tells failures by numbers or null; all of them are lack of memory.
void demand(bool done) {
  if (!done) throw std::bad_alloc();
}

// Lays out a part of a table. The library pads to the columns' widths; what is too wide has been cut before,
// because it would cut without a mark.
class Layout {
 public:
  Layout(bool hasHead, bool hasColour) : table_(scols_new_table()) {
    demand(table_ != nullptr);
    // The texts are safe already, and what they escape must not be escaped again.
    demand(scols_table_enable_noencoding(table_.get(), 1) == 0);
    demand(scols_table_enable_noheadings(table_.get(), hasHead ? 0 : 1) == 0);
    demand(scols_table_enable_colors(table_.get(), hasColour ? 1 : 0) == 0);
    demand(scols_table_set_column_separator(table_.get(), std::string(kGap, ' ').c_str()) == 0);
    // It would look at the terminal of its own accord.
    demand(scols_table_set_termforce(table_.get(), SCOLS_TERMFORCE_NEVER) == 0);
  }
  void addColumn(const std::string& name, std::size_t width) {
    libscols_column* const column = scols_table_new_column(table_.get(), name.c_str(), 0, 0);
    demand(column != nullptr);
    // Below 1 it would be a part of the line.
    if (width > 0) demand(scols_column_set_whint(column, static_cast<double>(width)) == 0);
  }
  void addLine() {
    line_ = scols_table_new_line(table_.get(), nullptr);
    demand(line_ != nullptr);
    column_ = 0;
  }
  // The next cell of the line.
  void add(const std::string& text, Table::Style style) {
    demand(scols_line_set_data(line_, column_, text.c_str()) == 0);
    if (const char* sequence = sequenceOf(style)) {
      libscols_cell* const cell = scols_line_get_cell(line_, column_);
      demand(cell != nullptr && scols_cell_set_color(cell, sequence) == 0);
    }
    ++column_;
  }
  void print(std::ostream& out) {
    const Utf8Locale locale;
    char* text = nullptr;
    demand(scols_print_table_to_string(table_.get(), &text) == 0);
    const std::unique_ptr<char, FreeText> owned(text);
    out << text << '\n';
  }

 private:
  const std::unique_ptr<libscols_table, FreeTable> table_;
  libscols_line* line_ = nullptr;  // the table has it
  std::size_t column_ = 0;
};

}  // namespace

Table::Cell::Cell(const Value& value) : text(value.text()), json(jsonOf(value)) {}

Table::Cell Table::Cell::time(double seconds) {
  Cell cell(localTime(seconds), jsonOf(Value(seconds)));
  cell.isWhole = true;
  return cell;
}

Table::Cell Table::Cell::in(Style other) const {
  Cell cell = *this;
  cell.style = other;
  return cell;
}

Table::Table(const Tool& tool, std::vector<std::string> columns)
    : Table(tool.out, tool.asJson, std::move(columns)) {
  width_ = widthOf(tool);
  hasColour_ = colours::areWanted(tool);
}

Table::Table(std::ostream& out, bool asJson, std::vector<std::string> columns)
    : out_(out), asJson_(asJson), columns_(std::move(columns)) {
  for (std::string& column : columns_) {
    if (!asJson) column = printable(std::move(column));
    widths_.push_back(textWidth(column));
  }
  isDropped_.resize(columns_.size());
  isWhole_.resize(columns_.size());
}

void Table::dropWhenNarrow(const std::vector<std::string>& columns) {
  for (const std::string& column : columns) {
    const auto found = std::find(columns_.begin(), columns_.end(), column);
    if (found != columns_.end()) toDrop_.push_back(static_cast<std::size_t>(found - columns_.begin()));
  }
}

Table::~Table() { print(); }

void Table::add(std::vector<Cell> cells) {
  if (asJson_) {
    for (std::size_t at = 0; at < columns_.size(); ++at) {
      out_ << (at == 0 ? '{' : ',') << printable(jsonOf(Value(columns_[at]))) << ':'
           << printable(cells[at].json);
    }
    out_ << "}\n";
    return;
  }
  Row row;
  for (std::size_t at = 0; at < columns_.size(); ++at) {
    row.push_back({printable(std::move(cells[at].text)), cells[at].style});
    widths_[at] = std::max(widths_[at], textWidth(row.back().text));
    rowBytes_ += row.back().text.size();
    if (cells[at].isWhole) isWhole_[at] = true;
  }
  rows_.push_back(std::move(row));
  if (rows_.size() >= kPortion || rowBytes_ >= kPortionBytes) print();
}

void Table::print() {
  if (!headPrinted_) dropColumns();
  std::optional<std::vector<std::size_t>> widths = inBlocks_ ? std::nullopt : fittingWidths();
  // What has begun as a table stays one.
  if (!widths && headPrinted_) widths = limited(kNarrowest);
  if (!rows_.empty() && widths) printRows(*widths);
  for (const Row& row : rows_) {
    if (widths) break;
    inBlocks_ = true;
    printBlock(row);
  }
  rows_.clear();
  rowBytes_ = 0;
  out_.flush();
}

void Table::dropColumns() {
  for (const std::size_t column : toDrop_) {
    if (!width_ || lengthOf(widths_) <= *width_) return;
    isDropped_[column] = true;
  }
}

std::size_t Table::lengthOf(const std::vector<std::size_t>& widths) const {
  std::size_t length = 0;
  for (std::size_t at = 0; at < widths.size(); ++at) {
    if (!isDropped_[at]) length += (length == 0 ? 0 : kGap) + widths[at];
  }
  return length;
}

// All columns have one limit, the highest with which the line fits.
std::optional<std::vector<std::size_t>> Table::fittingWidths() const {
  if (!width_) return widths_;
  std::size_t limit = std::min(*std::max_element(widths_.begin(), widths_.end()), *width_);
  while (limit > kNarrowest && lengthOf(limited(limit)) > *width_) --limit;
  return lengthOf(limited(limit)) > *width_ ? std::nullopt : std::optional(limited(limit));
}

std::vector<std::size_t> Table::limited(std::size_t limit) const {
  std::vector<std::size_t> widths = widths_;
  for (std::size_t at = 0; at < widths.size(); ++at) {
    if (!isWhole_[at]) widths[at] = std::min(widths[at], limit);
  }
  return widths;
}

void Table::printRows(const std::vector<std::size_t>& widths) {
  Layout layout(!std::exchange(headPrinted_, true), hasColour_);
  for (std::size_t at = 0; at < columns_.size(); ++at) {
    if (!isDropped_[at]) layout.addColumn(cutToWidth(columns_[at], widths[at]), widths[at]);
  }
  for (const Row& row : rows_) {
    layout.addLine();
    for (std::size_t at = 0; at < row.size(); ++at) {
      if (!isDropped_[at]) layout.add(cutToWidth(row[at].text, widths[at]), row[at].style);
    }
  }
  layout.print(out_);
}

void Table::printBlock(const Row& row) {
  std::size_t longest = 0;
  for (const std::string& column : columns_) longest = std::max(longest, textWidth(column));
  for (std::size_t at = 0; at < row.size(); ++at) {
    out_ << columns_[at];
    if (!row[at].text.empty())
      out_ << std::string(longest - textWidth(columns_[at]) + kGap, ' ') << row[at].text;
    out_ << '\n';
  }
  out_ << '\n';
}

}  // namespace tonewerk
