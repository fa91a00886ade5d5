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

std::string jsonOf(const Value& value) {
  std::string json;
  appendCompactJson(json, value);
  return json;
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
  }
  rows_.push_back(std::move(texts));
  if (rows_.size() >= kPortion) print();
}

void Table::print() {
  if (!rows_.empty() && !std::exchange(headPrinted_, true)) printRow(columns_);
  for (const std::vector<std::string>& row : rows_) printRow(row);
  rows_.clear();
  out_.flush();
}

void Table::printRow(const std::vector<std::string>& texts) {
  for (std::size_t at = 0; at < texts.size(); ++at) {
    out_ << texts[at];
    if (at + 1 < texts.size()) out_ << std::string(widths_[at] - utf8Characters(texts[at]) + 2, ' ');
  }
  out_ << '\n';
}

}  // namespace tonewerk
