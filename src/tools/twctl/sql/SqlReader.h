// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

struct sqlite3;
struct sqlite3_stmt;

namespace tonewerk {

struct SqlBytes {
  std::string bytes;
  friend bool operator==(const SqlBytes&, const SqlBytes&) = default;
};

// What a column of a row holds: nothing (NULL), a number, a text (UTF-8) or bytes.
using SqlValue = std::variant<std::monostate, std::int64_t, double, std::string, SqlBytes>;

// Why a query has no (more) rows.
struct SqlProblem {
  enum class Kind {
    kQuery,        // the query is wrong, or asks for more than reading
    kInterrupted,  // by the user
    kFile,         // the file cannot be read
  };
  Kind kind = Kind::kQuery;
  std::string text;
  std::size_t place = 0;  // of kQuery: the byte of the text where SQLite gave up
};

class SqlReader;

// One query of a SqlReader, which outlives it.
class SqlQuery {
 public:
  // `begin` is the byte of the text at which the statement begins.
  SqlQuery(SqlReader& reader, sqlite3_stmt* statement, std::size_t begin);
  SqlQuery(const SqlQuery&) = delete;
  SqlQuery& operator=(const SqlQuery&) = delete;
  ~SqlQuery();

  // The names of the columns, each once: the second "id" is "id_2".
  std::vector<std::string> columns() const;
  // Whether there is a next row. False at the end, and on a failure, which is then in `problem`.
  [[nodiscard]] bool next(std::optional<SqlProblem>& problem);
  SqlValue value(int column) const;
  // Replaces the parameter ?1, ?2, ... The text is not copied.
  void bind(int parameter, std::string_view text);
  void restart();

 private:
  SqlReader& reader_;
  sqlite3_stmt* statement_;
  const std::size_t begin_;
};

// Runs queries of people on a SQLite file, which no query can change: it is opened read-only, other files
// cannot be attached, libraries cannot be loaded, and everything but reading is refused. Used by one thread.
class SqlReader {
 public:
  SqlReader() = default;
  SqlReader(const SqlReader&) = delete;
  SqlReader& operator=(const SqlReader&) = delete;
  ~SqlReader();

  // Call once. The problem when the file cannot be read; else empty.
  [[nodiscard]] std::string open(const std::string& path);

  // While a query runs, `isInterrupted` is asked some hundred times a second. The query ends when it is true.
  void interruptWhen(std::function<bool()> isInterrupted) { isInterrupted_ = std::move(isInterrupted); }

  // Makes a query of the first statement of `text` from the byte `from` on, and sets `from` behind it. Null
  // without a problem when only spaces and comments are left.
  [[nodiscard]] std::unique_ptr<SqlQuery> prepare(const std::string& text, std::size_t& from,
                                                  std::optional<SqlProblem>& problem);

  // All rows of a query with texts for its parameters; none on a failure.
  std::vector<std::vector<SqlValue>> rows(const std::string& sql,
                                          std::initializer_list<std::string_view> parameters = {});

  // The same JSON without white space; none when `text` is not JSON.
  std::optional<std::string> compactJson(std::string_view text);

 private:
  friend class SqlQuery;

  [[nodiscard]] bool openAs(const std::string& name, int flags);
  void restrict();
  SqlProblem problem(std::size_t begin) const;
  static int authorize(void* reader, int action, const char* first, const char* second, const char* database,
                       const char* trigger);
  static int progress(void* reader);

  sqlite3* database_ = nullptr;
  std::unique_ptr<SqlQuery> compact_;
  std::function<bool()> isInterrupted_;
  bool isRefused_ = false;  // the last statement asked for more than reading
};

// Whether `text` ends with a whole statement.
bool isWholeStatement(const std::string& text);

}  // namespace tonewerk
