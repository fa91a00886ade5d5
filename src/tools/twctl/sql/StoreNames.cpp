// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/StoreNames.h"

#include <algorithm>
#include <array>

namespace tonewerk {
namespace {

// What the store's tables and views call the time of a row.
constexpr std::array<std::string_view, 5> kTimeColumns{"at", "started_at", "recorded_at", "posted_at",
                                                       "sent_at"};

std::string textOf(const SqlValue& value) {
  const auto* text = std::get_if<std::string>(&value);
  return text == nullptr ? "" : *text;
}

std::vector<std::string> namesOf(SqlReader& reader, std::string_view type) {
  std::vector<std::string> names;
  const auto rows = reader.rows(
      "SELECT name FROM sqlite_schema WHERE type = ?1 AND name NOT GLOB 'sqlite_*' ORDER BY name", {type});
  names.reserve(rows.size());
  for (const auto& row : rows) names.push_back(textOf(row[0]));
  return names;
}

void take(SqlReader& reader, const std::string& table, const std::string& column, const char* direction,
          std::optional<StoreSpan>& span) {
  const auto rows = reader.rows("SELECT CAST(" + sqlName(column) + " AS REAL) FROM " + sqlName(table) +
                                " ORDER BY rowid " + direction + " LIMIT 1");
  const auto* time = rows.empty() ? nullptr : std::get_if<double>(&rows[0][0]);
  if (time == nullptr) return;
  if (!span) span = StoreSpan{*time, *time};
  span->from = std::min(span->from, *time);
  span->until = std::max(span->until, *time);
}

}  // namespace

std::vector<std::string> viewsOf(SqlReader& reader) { return namesOf(reader, "view"); }

std::vector<std::string> tablesOf(SqlReader& reader) { return namesOf(reader, "table"); }

std::vector<std::string> readableNamesOf(SqlReader& reader) {
  std::vector<std::string> names = viewsOf(reader);
  return names.empty() ? tablesOf(reader) : names;
}

std::optional<std::string> nameInStore(SqlReader& reader, std::string_view name) {
  const auto rows = reader.rows(
      "SELECT name FROM sqlite_schema WHERE type IN ('table', 'view') AND name = ?1 COLLATE NOCASE", {name});
  if (rows.empty()) return std::nullopt;
  return textOf(rows[0][0]);
}

std::vector<StoreColumn> columnsOf(SqlReader& reader, const std::string& name) {
  std::vector<StoreColumn> columns;
  for (const auto& row : reader.rows("SELECT name, type FROM pragma_table_xinfo(?1)", {name}))
    columns.push_back({textOf(row[0]), textOf(row[1])});
  return columns;
}

std::string definitionOf(SqlReader& reader, const std::string& name) {
  const auto rows =
      reader.rows("SELECT sql FROM sqlite_schema WHERE type IN ('table', 'view') AND name = ?1", {name});
  return rows.empty() ? "" : textOf(rows[0][0]);
}

std::optional<std::string> timeColumnOf(const std::vector<StoreColumn>& columns) {
  for (const std::string_view time : kTimeColumns) {
    for (const StoreColumn& column : columns) {
      if (column.name == time) return column.name;
    }
  }
  return std::nullopt;
}

std::optional<StoreSpan> spanOf(SqlReader& reader) {
  std::optional<StoreSpan> span;
  for (const std::string& table : tablesOf(reader)) {
    const std::optional<std::string> time = timeColumnOf(columnsOf(reader, table));
    if (!time) continue;
    take(reader, table, *time, "ASC", span);
    take(reader, table, *time, "DESC", span);
  }
  return span;
}

std::string sqlName(std::string_view name) {
  std::string text = "\"";
  for (const char c : name) {
    if (c == '"') text += '"';
    text += c;
  }
  return text + '"';
}

}  // namespace tonewerk
