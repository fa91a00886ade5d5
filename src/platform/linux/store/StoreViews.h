// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

class SqliteDatabase;

// The views of the report store for people who ask it. One row is one thing; columns are typed, and null
// where nothing is known. docs/views.md is made of these descriptions.

struct StoreViewColumn {
  std::string_view name;
  std::string_view type;  // "integer", "real" or "text"
  std::string_view about;
};

struct StoreView {
  std::string_view name;
  std::string_view row;  // what a row is
  std::vector<StoreViewColumn> columns;
  std::string select;  // gives these columns
};

// In the order in which a reader needs them.
const std::vector<StoreView>& storeViews();

// The SQL that makes them all.
std::string storeViewsSql();

// Makes the views that an open file lacks, or that it has in another form. A daemon may so improve them
// without a new version of the schema. False on failure. The database then has the problem.
[[nodiscard]] bool ensureStoreViews(SqliteDatabase& database);

}  // namespace tonewerk
