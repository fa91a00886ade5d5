// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/SqliteDatabase.h"

#include <sqlite3.h>
#include <utility>

#include "platform/Heartbeat.h"
#include "protocol/RequestSet.h"
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

void SqliteStatement::bindUnlessZero(int parameter, std::int64_t number) {
  if (number == 0) {
    bindNull(parameter);
  } else {
    bind(parameter, number);
  }
}

void SqliteStatement::bindUser(int parameter, std::uint32_t user) {
  if (user == kNoUser) {
    bindNull(parameter);
  } else {
    bind(parameter, static_cast<std::int64_t>(user));
  }
}

void SqliteStatement::bindColumn(int parameter, const SqliteStatement& row, int column) {
  sqlite3_bind_value(statement_, parameter, sqlite3_column_value(row.statement_, column));
}

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

std::optional<std::int64_t> SqliteStatement::firstNumber() {
  std::optional<std::int64_t> found;
  if (step() == Step::kRow) found = integer(0);
  reset();
  return found;
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

bool SqliteStatement::isValid(int column) const {
  return sqlite3_column_type(statement_, column) != SQLITE_TEXT || text(column) == bytes(column);
}

namespace {

// Escapes a file name for the path of a URI.
std::string uriPath(const std::string& path) {
  std::string escaped;
  for (const char c : path) {
    if (c == '%' || c == '?' || c == '#') {
      static constexpr char kDigits[] = "0123456789abcdef";
      escaped +=
          {'%', kDigits[static_cast<unsigned char>(c) >> 4], kDigits[static_cast<unsigned char>(c) & 15]};
    } else {
      escaped += c;
    }
  }
  return escaped;
}

// SQLite counts the memory that it uses, under a lock that all threads share, unless it is told before its
// first use not to. Nobody asks for the count.
void disableMemoryStatistics() {
  static const int result = sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0);
  (void)result;  // it fails when another library has used SQLite before, and then only costs time
}

// A statement that changes the whole file takes minutes on a slow disk, but it takes steps all the time.
constexpr int kStepsPerBeat = 100'000;

int beat(void* /*unused*/) {
  Heartbeat::beatHere();
  return 0;  // the statement goes on
}

}  // namespace

SqliteDatabase::~SqliteDatabase() { close(); }

bool SqliteDatabase::open(const std::string& path, Mode mode, std::chrono::milliseconds patience) {
  close();
  disableMemoryStatistics();
  int flags = SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_EXRESCODE;
  flags |= mode == Mode::kReadWrite ? SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE : SQLITE_OPEN_READONLY;
  std::string name = path;
  if (mode == Mode::kImmutable) {
    flags |= SQLITE_OPEN_URI;
    name = "file:" + uriPath(path) + "?immutable=1";
  }
  isOpen_ = sqlite3_open_v2(name.c_str(), &database_, flags, nullptr) == SQLITE_OK;
  if (isOpen_) {
    sqlite3_busy_timeout(database_, static_cast<int>(patience.count()));
    sqlite3_progress_handler(database_, kStepsPerBeat, beat, nullptr);
  }
  return isOpen_;
}

void SqliteDatabase::close() {
  sqlite3_close_v2(std::exchange(database_, nullptr));
  isOpen_ = false;
}

bool SqliteDatabase::run(const std::string& sql) {
  return sqlite3_exec(database_, sql.c_str(), nullptr, nullptr, nullptr) == SQLITE_OK;
}

SqliteStatement SqliteDatabase::prepare(const std::string& sql) {
  sqlite3_stmt* statement = nullptr;
  sqlite3_prepare_v3(database_, sql.c_str(), static_cast<int>(sql.size()) + 1, SQLITE_PREPARE_PERSISTENT,
                     &statement, nullptr);
  return SqliteStatement(statement);
}

std::optional<std::int64_t> SqliteDatabase::number(const std::string& sql) {
  SqliteStatement statement = prepare(sql);
  return statement ? statement.firstNumber() : std::nullopt;
}

std::int64_t SqliteDatabase::changes() const { return sqlite3_changes64(database_); }

std::int64_t SqliteDatabase::insertedRow() const { return sqlite3_last_insert_rowid(database_); }

bool SqliteDatabase::hasMoved() const {
  int moved = 0;
  return sqlite3_file_control(database_, "main", SQLITE_FCNTL_HAS_MOVED, &moved) == SQLITE_OK && moved != 0;
}

std::string SqliteDatabase::problem() const {
  if (database_ == nullptr) return "not open";
  return sqlite3_errmsg(database_);
}

bool SqliteDatabase::isCorrupt() const {
  if (database_ == nullptr) return false;
  const int code = sqlite3_extended_errcode(database_) & 0xff;
  return code == SQLITE_CORRUPT || code == SQLITE_NOTADB;
}

}  // namespace tonewerk
