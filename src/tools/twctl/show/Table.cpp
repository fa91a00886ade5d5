// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Table.h"

#include <algorithm>
#include <ostream>
#include <utility>

#include "values/CompactJson.h"
#include "values/PrintableText.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr std::size_t kGap = 2;  // spaces between columns

std::string jsonOf(const Value& value) {
  std::string json;
  appendCompactJson(json, value);
  return json;
}

// `text` with at most `width` characters; "…" is the last one of what was longer.
std::string cut(const std::string& text, std::size_t width) {
  if (utf8Characters(text) <= width) return text;
  std::size_t end = 0;
  for (std::size_t kept = 1; kept < width; ++kept) {
    ++end;
    while (end < text.size() && isUtf8Continuation(text[end])) ++end;
  }
  return text.substr(0, end) + "\u2026";
}

}  // namespace

Table::Cell::Cell(const Value& value) : text(value.text()), json(jsonOf(value)) {}

Table::Cell Table::Cell::time(double seconds) { return {textOf(Date{seconds}), jsonOf(Value(seconds))}; }

Table::Table(std::ostream& out, bool asJson, std::vector<std::string> columns)
    : out_(out), asJson_(asJson), columns_(std::move(columns)) {
  for (const std::string& column : columns_) widths_.push_back(utf8Characters(column));
}

Table::~Table() { print(); }

void Table::add(std::vector<Cell> cells) {
  if (asJson_) {
    for (std::size_t at = 0; at < columns_.size(); ++at) {
      out_ << (at == 0 ? '{' : ',') << jsonOf(Value(columns_[at])) << ':' << printable(cells[at].json);
    }
    out_ << "}\n";
    return;
  }
  std::vector<std::string> texts;
  for (std::size_t at = 0; at < columns_.size(); ++at) {
    texts.push_back(printable(std::move(cells[at].text)));
    widths_[at] = std::max(widths_[at], utf8Characters(texts.back()));
    rowBytes_ += texts.back().size();
  }
  rows_.push_back(std::move(texts));
  if (rows_.size() >= kPortion || rowBytes_ >= kPortionBytes) print();
}

void Table::print() {
  std::optional<std::vector<std::size_t>> widths = inBlocks_ ? std::nullopt : fittingWidths();
  // What has begun as a table stays one.
  if (!widths && headPrinted_) widths = limited(kNarrowest);
  if (!rows_.empty() && widths && !std::exchange(headPrinted_, true)) printRow(columns_, *widths);
  for (const std::vector<std::string>& row : rows_) {
    if (widths) {
      printRow(row, *widths);
    } else {
      inBlocks_ = true;
      printBlock(row);
    }
  }
  rows_.clear();
  rowBytes_ = 0;
  out_.flush();
}

// All columns have one limit, the highest with which the line fits.
std::optional<std::vector<std::size_t>> Table::fittingWidths() const {
  if (!width_) return widths_;
  std::size_t limit = std::min(*std::max_element(widths_.begin(), widths_.end()), *width_);
  const auto total = [&] {
    std::size_t sum = kGap * (widths_.size() - 1);
    for (const std::size_t width : widths_) sum += std::min(width, limit);
    return sum;
  };
  while (limit > kNarrowest && total() > *width_) --limit;
  return total() > *width_ ? std::nullopt : std::optional(limited(limit));
}

std::vector<std::size_t> Table::limited(std::size_t limit) const {
  std::vector<std::size_t> widths = widths_;
  for (std::size_t& width : widths) width = std::min(width, limit);
  return widths;
}

void Table::printRow(const std::vector<std::string>& texts, const std::vector<std::size_t>& widths) {
  for (std::size_t at = 0; at < texts.size(); ++at) {
    const std::string text = cut(texts[at], widths[at]);
    out_ << text;
    if (at + 1 < texts.size()) out_ << std::string(widths[at] - utf8Characters(text) + kGap, ' ');
  }
  out_ << '\n';
}

void Table::printBlock(const std::vector<std::string>& texts) {
  std::size_t longest = 0;
  for (const std::string& column : columns_) longest = std::max(longest, utf8Characters(column));
  for (std::size_t at = 0; at < texts.size(); ++at) {
    out_ << columns_[at];
    if (!texts[at].empty())
      out_ << std::string(longest - utf8Characters(columns_[at]) + kGap, ' ') << texts[at];
    out_ << '\n';
  }
  out_ << '\n';
}

}  // namespace tonewerk
