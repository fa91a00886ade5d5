// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/RowWriter.h"

#include <algorithm>
#include <array>
#include <ostream>
#include <string_view>

#include "tools/twctl/show/Table.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

// The columns of the store that hold JSON. SQLite has no such type, so the file cannot tell.
constexpr std::array<std::string_view, 3> kJsonColumns{"payload", "session_info", "user_info"};

std::string hexadecimal(std::string_view bytes) {
  static constexpr char kDigits[] = "0123456789abcdef";
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    text += {kDigits[byte >> 4], kDigits[byte & 15]};
  }
  return text;
}

std::string textOfValue(const SqlValue& value) {
  if (const auto* integer = std::get_if<std::int64_t>(&value)) return std::to_string(*integer);
  if (const auto* number = std::get_if<double>(&value)) return textOf(*number);
  if (const auto* text = std::get_if<std::string>(&value)) return *text;
  if (const auto* bytes = std::get_if<SqlBytes>(&value)) return hexadecimal(bytes->bytes);
  return "";
}

std::string jsonOf(const Value& value) {
  std::string json;
  appendCompactJson(json, value);
  return json;
}

// In columns for people, or as JSON lines.
class TableRows final : public RowWriter {
 public:
  TableRows(const RowFormat& format, SqlReader& reader, std::ostream& out)
      : format_(format), reader_(reader), out_(out) {}

  void begin(const std::vector<std::string>& columns) override {
    columns_ = columns;
    table_ = std::make_unique<Table>(out_, format_.kind == RowFormat::Kind::kJson, columns);
    if (format_.width) table_->fit(*format_.width);
  }
  void add(const std::vector<SqlValue>& row) override {
    std::vector<Table::Cell> cells;
    for (std::size_t at = 0; at < row.size(); ++at) cells.push_back(cell(row[at], columns_[at]));
    table_->add(std::move(cells));
  }
  void end() override { table_.reset(); }

 private:
  Table::Cell cell(const SqlValue& value, const std::string& column) {
    if (format_.kind == RowFormat::Kind::kTable) return {textOfValue(value), ""};
    return {"", json(value, column)};
  }
  std::string json(const SqlValue& value, const std::string& column) {
    if (std::holds_alternative<std::monostate>(value)) return "null";
    if (const auto* integer = std::get_if<std::int64_t>(&value)) return jsonOf(Value(*integer));
    if (const auto* number = std::get_if<double>(&value)) return jsonOf(Value(*number));
    const std::string text = textOfValue(value);
    const bool mayBeObject = std::holds_alternative<std::string>(value) && text.starts_with('{');
    if (mayBeObject && std::find(kJsonColumns.begin(), kJsonColumns.end(), column) != kJsonColumns.end()) {
      if (std::optional<std::string> object = reader_.compactJson(text)) return *object;
    }
    return jsonOf(Value(text));
  }

  const RowFormat format_;
  SqlReader& reader_;
  std::ostream& out_;
  std::vector<std::string> columns_;
  std::unique_ptr<Table> table_;
};

class CsvRows final : public RowWriter {
 public:
  CsvRows(bool escapes, std::ostream& out) : escapes_(escapes), out_(out) {}

  void begin(const std::vector<std::string>& columns) override {
    std::vector<SqlValue> names(columns.begin(), columns.end());
    add(names);
  }
  void add(const std::vector<SqlValue>& row) override {
    for (std::size_t at = 0; at < row.size(); ++at) {
      if (at > 0) out_ << ',';
      const std::string text = textOfValue(row[at]);
      const bool isText = std::holds_alternative<std::string>(row[at]);
      // Many readers skip an empty line.
      const bool isWholeLine = row.size() == 1 && text.empty();
      write(text,
            isWholeLine || (isText && (text.empty() || text.find_first_of(",\"\r\n") != std::string::npos)));
    }
    out_ << "\r\n";
  }
  void end() override { out_.flush(); }

 private:
  void write(const std::string& text, bool inQuotes) {
    const std::string shown = escapes_ ? printable(text) : text;
    if (!inQuotes) {
      out_ << shown;
      return;
    }
    out_ << '"';
    for (const char c : shown) {
      if (c == '"') out_ << '"';
      out_ << c;
    }
    out_ << '"';
  }

  const bool escapes_;
  std::ostream& out_;
};

}  // namespace

std::unique_ptr<RowWriter> makeRowWriter(const RowFormat& format, SqlReader& reader, std::ostream& out) {
  if (format.kind == RowFormat::Kind::kCsv) return std::make_unique<CsvRows>(format.escapes, out);
  return std::make_unique<TableRows>(format, reader, out);
}

}  // namespace tonewerk
