// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Table.h"

#include <algorithm>
#include <ostream>
#include <utility>

#include "tools/twctl/show/LocalTime.h"
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

Table::Cell Table::Cell::time(double seconds) { return {localTime(seconds), jsonOf(Value(seconds))}; }

Table::Table(std::ostream& out, bool asJson, std::vector<std::string> columns)
    : out_(out), asJson_(asJson), columns_(std::move(columns)) {
  for (const std::string& column : columns_) widths_.push_back(utf8Characters(column));
  isDropped_.resize(columns_.size());
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
  if (!headPrinted_) dropColumns();
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
  for (std::size_t& width : widths) width = std::min(width, limit);
  return widths;
}

void Table::printRow(const std::vector<std::string>& texts, const std::vector<std::size_t>& widths) {
  std::size_t last = texts.size() - 1;
  while (last > 0 && isDropped_[last]) --last;
  for (std::size_t at = 0; at <= last; ++at) {
    if (isDropped_[at]) continue;
    const std::string text = cut(texts[at], widths[at]);
    out_ << text;
    if (at < last) out_ << std::string(widths[at] - utf8Characters(text) + kGap, ' ');
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
