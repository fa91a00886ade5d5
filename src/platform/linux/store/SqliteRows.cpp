// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/SqliteRows.h"

#include <new>
#include <sqlite3.h>
#include <string>

#include "platform/linux/store/SqliteDatabase.h"
#include "protocol/RequestSet.h"

namespace tonewerk {
namespace {

// SQLite keeps its own part of a table and of a cursor at their beginning.
struct RowsTable : sqlite3_vtab {
  const SqliteRows* rows;
};

struct RowsCursor : sqlite3_vtab_cursor {
  const SqliteRows* rows;
  std::size_t row;
  std::size_t end;
};

// What the database knows of rows: passed to connect().
struct RowsModule {
  const SqliteRows& rows;
  std::string columns;
};

RowsCursor& cursorOf(sqlite3_vtab_cursor* cursor) { return *static_cast<RowsCursor*>(cursor); }

int connect(sqlite3* database, void* context, int, const char* const*, sqlite3_vtab** made, char**) {
  const auto& module = *static_cast<const RowsModule*>(context);
  const int declared = sqlite3_declare_vtab(database, module.columns.c_str());
  if (declared != SQLITE_OK) return declared;
  auto* table = new (std::nothrow) RowsTable{{}, &module.rows};
  if (table == nullptr) return SQLITE_NOMEM;
  *made = table;
  return SQLITE_OK;
}

int disconnect(sqlite3_vtab* table) {
  delete static_cast<RowsTable*>(table);
  return SQLITE_OK;
}

// There is one way to read the rows: all of them.
int bestIndex(sqlite3_vtab* table, sqlite3_index_info* plan) {
  plan->estimatedRows = static_cast<sqlite3_int64>(static_cast<RowsTable*>(table)->rows->rowCount());
  plan->estimatedCost = static_cast<double>(plan->estimatedRows);
  return SQLITE_OK;
}

int open(sqlite3_vtab* table, sqlite3_vtab_cursor** made) {
  auto* cursor = new (std::nothrow) RowsCursor{{}, static_cast<RowsTable*>(table)->rows, 0, 0};
  if (cursor == nullptr) return SQLITE_NOMEM;
  *made = cursor;
  return SQLITE_OK;
}

int close(sqlite3_vtab_cursor* cursor) {
  delete &cursorOf(cursor);
  return SQLITE_OK;
}

int filter(sqlite3_vtab_cursor* base, int, const char*, int, sqlite3_value**) {
  RowsCursor& cursor = cursorOf(base);
  cursor.row = 0;
  cursor.end = cursor.rows->rowCount();
  return SQLITE_OK;
}

int next(sqlite3_vtab_cursor* base) {
  ++cursorOf(base).row;
  return SQLITE_OK;
}

int isAtEnd(sqlite3_vtab_cursor* base) { return cursorOf(base).row >= cursorOf(base).end ? 1 : 0; }

int column(sqlite3_vtab_cursor* base, sqlite3_context* context, int column) {
  SqliteCell cell(context);
  cursorOf(base).rows->read(cursorOf(base).row, column, cell);
  return SQLITE_OK;
}

int rowIdentifier(sqlite3_vtab_cursor* base, sqlite3_int64* identifier) {
  *identifier = static_cast<sqlite3_int64>(cursorOf(base).row);
  return SQLITE_OK;
}

// Without a function to create tables: the table exists under the module's name, and only there.
const sqlite3_module kModule = [] {
  sqlite3_module module{};
  module.xConnect = connect;
  module.xBestIndex = bestIndex;
  module.xDisconnect = disconnect;
  module.xOpen = open;
  module.xClose = close;
  module.xFilter = filter;
  module.xNext = next;
  module.xEof = isAtEnd;
  module.xColumn = column;
  module.xRowid = rowIdentifier;
  return module;
}();

}  // namespace

void SqliteCell::set(std::int64_t number) { sqlite3_result_int64(context_, number); }

void SqliteCell::setUser(std::uint32_t user) {
  if (user != kNoUser) set(static_cast<std::int64_t>(user));
}

void SqliteCell::set(double number) { sqlite3_result_double(context_, number); }

void SqliteCell::set(std::string_view text) {
  // A null pointer would be a null instead of an empty text.
  const char* data = text.data() == nullptr ? "" : text.data();
  sqlite3_result_text64(context_, data, text.size(), SQLITE_STATIC, SQLITE_UTF8);
}

void SqliteCell::setBytes(std::string_view bytes) {
  const char* data = bytes.data() == nullptr ? "" : bytes.data();
  sqlite3_result_blob64(context_, data, bytes.size(), SQLITE_STATIC);
}

void SqliteDatabase::addRows(const std::string& name, int columns, const SqliteRows& rows) {
  std::string declaration = "CREATE TABLE rows(";
  for (int column = 0; column < columns; ++column) {
    declaration += (column > 0 ? ", c" : "c") + std::to_string(column);
  }
  auto* module = new RowsModule{rows, declaration + ")"};
  sqlite3_create_module_v2(database_, name.c_str(), &kModule, module,
                           [](void* made) { delete static_cast<RowsModule*>(made); });
}

}  // namespace tonewerk
