// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/SqliteStatement.h"

#include <sqlite3.h>
#include <utility>

#include "values/Utf8.h"

namespace tonewerk {

SqliteStatement::SqliteStatement(SqliteStatement&& other) noexcept
    : statement_(std::exchange(other.statement_, nullptr)) {}

SqliteStatement& SqliteStatement::operator=(SqliteStatement&& other) noexcept {
  std::swap(statement_, other.statement_);
  return *this;
}

SqliteStatement::~SqliteStatement() { sqlite3_finalize(statement_); }

// A bind fails only for a text that is too long to store, or without memory. The parameter is then null,
// which the schema refuses.
void SqliteStatement::bind(int parameter, std::int64_t number) {
  sqlite3_bind_int64(statement_, parameter, number);
}

void SqliteStatement::bind(int parameter, double number) {
  sqlite3_bind_double(statement_, parameter, number);
}

void SqliteStatement::bind(int parameter, std::string_view text) {
  // A null pointer would bind a null instead of an empty text.
  const char* data = text.data() == nullptr ? "" : text.data();
  sqlite3_bind_text64(statement_, parameter, data, text.size(), SQLITE_STATIC, SQLITE_UTF8);
}

void SqliteStatement::bindBytes(int parameter, std::string_view bytes) {
  const char* data = bytes.data() == nullptr ? "" : bytes.data();
  sqlite3_bind_blob64(statement_, parameter, data, bytes.size(), SQLITE_STATIC);
}

void SqliteStatement::bindNull(int parameter) { sqlite3_bind_null(statement_, parameter); }

SqliteStatement::Step SqliteStatement::step() {
  switch (sqlite3_step(statement_)) {
    case SQLITE_ROW:
      return Step::kRow;
    case SQLITE_DONE:
      return Step::kDone;
    default:
      return Step::kFailed;
  }
}

void SqliteStatement::reset() { sqlite3_reset(statement_); }

bool SqliteStatement::run() {
  const bool done = step() == Step::kDone;
  reset();
  return done;
}

std::int64_t SqliteStatement::integer(int column) const { return sqlite3_column_int64(statement_, column); }

double SqliteStatement::number(int column) const { return sqlite3_column_double(statement_, column); }

std::string SqliteStatement::text(int column) const {
  const unsigned char* text = sqlite3_column_text(statement_, column);
  if (text == nullptr) return {};
  return validUtf8({reinterpret_cast<const char*>(text),
                    static_cast<std::size_t>(sqlite3_column_bytes(statement_, column))});
}

std::string SqliteStatement::bytes(int column) const {
  const void* bytes = sqlite3_column_blob(statement_, column);
  if (bytes == nullptr) return {};
  return {static_cast<const char*>(bytes),
          static_cast<std::size_t>(sqlite3_column_bytes(statement_, column))};
}

bool SqliteStatement::isNull(int column) const {
  return sqlite3_column_type(statement_, column) == SQLITE_NULL;
}

}  // namespace tonewerk
