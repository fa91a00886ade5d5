// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// What a store's file says of its tables and views. Each function asks the file.

struct StoreColumn {
  std::string name;
  std::string type;  // as declared; empty for most columns of a view that are computed
};

// The views, which are for people, and the tables below them. Sorted.
std::vector<std::string> viewsOf(SqlReader& reader);
std::vector<std::string> tablesOf(SqlReader& reader);

// The views; the tables of a file without views.
std::vector<std::string> readableNamesOf(SqlReader& reader);

// The name in the file of a table or view, which SQL finds in any case; none when there is none.
std::optional<std::string> nameInStore(SqlReader& reader, std::string_view name);

std::vector<StoreColumn> columnsOf(SqlReader& reader, const std::string& name);

// The SQL that made a table or view.
std::string definitionOf(SqlReader& reader, const std::string& name);

// The column with the time of a row: when it was, began, or was recorded. None when it has no time.
std::optional<std::string> timeColumnOf(const std::vector<StoreColumn>& columns);

struct StoreSpan {
  double from = 0.0;  // seconds since 1970
  double until = 0.0;
};

// The times of the oldest and the newest rows; none without rows. Found by key in the tables, which may have
// many rows, so it is not exact where the wall clock has jumped.
std::optional<StoreSpan> spanOf(SqlReader& reader);

// A name in quotes for SQL.
std::string sqlName(std::string_view name);

}  // namespace tonewerk
