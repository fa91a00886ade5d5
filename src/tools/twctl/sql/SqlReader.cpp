// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlReader.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <filesystem>
#include <sqlite3.h>
#include <system_error>
#include <utility>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr int kPatienceMilliseconds = 5'000;
// So many steps of SQLite's machine, some milliseconds, are between two questions whether to go on.
constexpr int kStepsPerQuestion = 20'000;
constexpr std::string_view kOnlyReading =
    "only reading is possible: SELECT, EXPLAIN, and PRAGMA statements that change nothing";

// The pragmas that tell something and change nothing, whatever their argument is.
constexpr std::array<std::string_view, 12> kTellingPragmas{
    "collation_list", "compile_options", "database_list", "foreign_key_list", "function_list", "index_info",
    "index_list",     "index_xinfo",     "module_list",   "table_info",       "table_list",    "table_xinfo"};
// Those that tell something without an argument, and else set it.
constexpr std::array<std::string_view, 7> kSettingPragmas{
    "application_id", "auto_vacuum", "encoding", "freelist_count", "page_count", "page_size", "user_version"};

std::string lower(std::string_view text) {
  std::string changed(text);
  std::transform(changed.begin(), changed.end(), changed.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return changed;
}

bool isReadingPragma(const char* name, const char* argument) {
  const std::string pragma = lower(name);
  if (std::find(kTellingPragmas.begin(), kTellingPragmas.end(), pragma) != kTellingPragmas.end()) return true;
  return argument == nullptr &&
         std::find(kSettingPragmas.begin(), kSettingPragmas.end(), pragma) != kSettingPragmas.end();
}

// A URI, so that SQLite can be told that nobody changes the file.
std::string immutable(const std::string& path) {
  std::string uri = "file:";
  for (const char c : path) {
    switch (c) {
      case '%':
        uri += "%25";
        break;
      case '?':
        uri += "%3f";
        break;
      case '#':
        uri += "%23";
        break;
      default:
        uri += c;
    }
  }
  return uri + "?immutable=1";
}

// The first byte from `from` on that is no white space.
std::size_t beginOfWord(std::string_view text, std::size_t from) {
  while (from < text.size() && std::isspace(static_cast<unsigned char>(text[from])) != 0) ++from;
  return from;
}

}  // namespace

SqlQuery::SqlQuery(SqlReader& reader, sqlite3_stmt* statement, std::size_t begin)
    : reader_(reader), statement_(statement), begin_(begin) {}

SqlQuery::~SqlQuery() { sqlite3_finalize(statement_); }

std::vector<std::string> SqlQuery::columns() const {
  std::vector<std::string> names;
  for (int at = 0; at < sqlite3_column_count(statement_); ++at) {
    const char* name = sqlite3_column_name(statement_, at);
    const std::string wanted = validUtf8(name == nullptr ? "" : name);
    std::string unique = wanted;
    for (int more = 2; std::find(names.begin(), names.end(), unique) != names.end(); ++more)
      unique = wanted + "_" + std::to_string(more);
    names.push_back(unique);
  }
  return names;
}

bool SqlQuery::next(std::optional<SqlProblem>& problem) {
  const int result = sqlite3_step(statement_);
  if (result != SQLITE_ROW && result != SQLITE_DONE) problem = reader_.problem(begin_);
  return result == SQLITE_ROW;
}

SqlValue SqlQuery::value(int column) const {
  const auto size = [&] { return static_cast<std::size_t>(sqlite3_column_bytes(statement_, column)); };
  switch (sqlite3_column_type(statement_, column)) {
    case SQLITE_INTEGER:
      return std::int64_t{sqlite3_column_int64(statement_, column)};
    case SQLITE_FLOAT:
      return sqlite3_column_double(statement_, column);
    case SQLITE_TEXT: {
      const unsigned char* text = sqlite3_column_text(statement_, column);
      return text == nullptr ? SqlValue() : validUtf8({reinterpret_cast<const char*>(text), size()});
    }
    case SQLITE_BLOB: {
      const void* bytes = sqlite3_column_blob(statement_, column);
      return SqlBytes{bytes == nullptr ? "" : std::string(static_cast<const char*>(bytes), size())};
    }
    default:
      return {};
  }
}

void SqlQuery::bind(int parameter, std::string_view text) {
  sqlite3_bind_text64(statement_, parameter, text.data() == nullptr ? "" : text.data(), text.size(),
                      SQLITE_STATIC, SQLITE_UTF8);
}

void SqlQuery::restart() { sqlite3_reset(statement_); }

SqlReader::~SqlReader() {
  compact_.reset();
  sqlite3_close_v2(database_);
}

std::string SqlReader::open(const std::string& path) {
  if (!openAs(path, 0)) {
    // Reading needs a side file, which a user without write permission for the directory cannot make. While a
    // daemon writes, the side file is there. Without one the file does not change.
    std::error_code error;
    if (std::filesystem::exists(path + "-wal", error) || !openAs(immutable(path), SQLITE_OPEN_URI))
      return path + ": " + (database_ == nullptr ? "no memory" : sqlite3_errmsg(database_));
  }
  restrict();
  return "";
}

// Reads something, because SQLite opens the file only then.
bool SqlReader::openAs(const std::string& name, int flags) {
  sqlite3_close_v2(std::exchange(database_, nullptr));
  flags |= SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX;
  if (sqlite3_open_v2(name.c_str(), &database_, flags, nullptr) != SQLITE_OK) return false;
  sqlite3_busy_timeout(database_, kPatienceMilliseconds);
  return sqlite3_exec(database_, "SELECT count(*) FROM sqlite_schema", nullptr, nullptr, nullptr) ==
         SQLITE_OK;
}

// Each of these would be enough against some statements; none is against all.
void SqlReader::restrict() {
  sqlite3_exec(database_, "PRAGMA query_only = 1", nullptr, nullptr, nullptr);
  sqlite3_db_config(database_, SQLITE_DBCONFIG_ENABLE_LOAD_EXTENSION, 0, nullptr);
  sqlite3_db_config(database_, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
  sqlite3_limit(database_, SQLITE_LIMIT_ATTACHED, 0);
  sqlite3_set_authorizer(database_, authorize, this);
  sqlite3_progress_handler(database_, kStepsPerQuestion, progress, this);
}

std::unique_ptr<SqlQuery> SqlReader::prepare(const std::string& text, std::size_t& from,
                                             std::optional<SqlProblem>& problem) {
  for (;;) {
    const std::size_t begin = beginOfWord(text, from);
    if (begin == text.size()) return nullptr;
    isRefused_ = false;
    sqlite3_stmt* statement = nullptr;
    const char* rest = nullptr;
    // The whole rest goes to SQLite, which finds the end of the statement.
    if (sqlite3_prepare_v2(database_, text.c_str() + begin, -1, &statement, &rest) != SQLITE_OK) {
      problem = this->problem(begin);
      return nullptr;
    }
    from = static_cast<std::size_t>(rest - text.c_str());
    if (statement != nullptr) {
      auto query = std::make_unique<SqlQuery>(*this, statement, begin);
      // VACUUM and REINDEX do not ask the authorizer before they run.
      if (sqlite3_column_count(statement) > 0 && sqlite3_stmt_readonly(statement) != 0) return query;
      problem = SqlProblem{SqlProblem::Kind::kQuery, std::string(kOnlyReading), begin};
      return nullptr;
    }
    if (from < text.size() && text[from] == '\0') {
      problem = SqlProblem{SqlProblem::Kind::kQuery, "the query has a zero byte", from};
      return nullptr;
    }
  }
}

SqlProblem SqlReader::problem(std::size_t begin) const {
  SqlProblem problem{SqlProblem::Kind::kQuery, validUtf8(sqlite3_errmsg(database_)), begin};
  if (const int offset = sqlite3_error_offset(database_); offset >= 0)
    problem.place = begin + static_cast<std::size_t>(offset);
  switch (sqlite3_errcode(database_)) {
    case SQLITE_INTERRUPT:
      problem.kind = SqlProblem::Kind::kInterrupted;
      problem.text = "interrupted";
      break;
    case SQLITE_AUTH:
    case SQLITE_READONLY:
      problem.text = kOnlyReading;
      break;
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
    case SQLITE_NOMEM:
    case SQLITE_IOERR:
    case SQLITE_CORRUPT:
    case SQLITE_FULL:
    case SQLITE_CANTOPEN:
    case SQLITE_PROTOCOL:
    case SQLITE_NOTADB:
      problem.kind = SqlProblem::Kind::kFile;
      break;
    default:
      if (isRefused_) problem.text = kOnlyReading;
  }
  return problem;
}

std::vector<std::vector<SqlValue>> SqlReader::rows(const std::string& sql,
                                                   std::initializer_list<std::string_view> parameters) {
  std::vector<std::vector<SqlValue>> found;
  std::optional<SqlProblem> problem;
  std::size_t from = 0;
  const std::unique_ptr<SqlQuery> query = prepare(sql, from, problem);
  if (query == nullptr) return found;
  int parameter = 0;
  for (const std::string_view text : parameters) query->bind(++parameter, text);
  const int columns = static_cast<int>(query->columns().size());
  while (query->next(problem)) {
    found.emplace_back();
    for (int at = 0; at < columns; ++at) found.back().push_back(query->value(at));
  }
  return problem ? std::vector<std::vector<SqlValue>>() : found;
}

std::optional<std::string> SqlReader::compactJson(std::string_view text) {
  std::optional<SqlProblem> problem;
  if (compact_ == nullptr) {
    std::size_t from = 0;
    compact_ = prepare("SELECT json(?1) WHERE json_valid(?1)", from, problem);
    if (compact_ == nullptr) return std::nullopt;
  }
  compact_->bind(1, text);
  std::optional<std::string> compact;
  if (compact_->next(problem)) {
    SqlValue value = compact_->value(0);
    if (auto* json = std::get_if<std::string>(&value)) compact = std::move(*json);
  }
  compact_->restart();
  return compact;
}

int SqlReader::authorize(void* reader, int action, const char* first, const char* second,
                         const char* /*database*/, const char* /*trigger*/) {
  bool isReading = false;
  switch (action) {
    case SQLITE_SELECT:
    case SQLITE_READ:
    case SQLITE_RECURSIVE:
      isReading = true;
      break;
    case SQLITE_FUNCTION:
      isReading = second != nullptr && lower(second) != "load_extension";
      break;
    case SQLITE_UPDATE:
      // The first use of a table-valued function, such as json_each(), asks for this and writes nothing. A
      // statement that would change this table is refused all the same.
      isReading = first != nullptr && std::string_view(first) == "sqlite_master";
      break;
    case SQLITE_PRAGMA:
      isReading = first != nullptr && isReadingPragma(first, second);
      break;
    default:
      break;
  }
  if (!isReading) static_cast<SqlReader*>(reader)->isRefused_ = true;
  return isReading ? SQLITE_OK : SQLITE_DENY;
}

int SqlReader::progress(void* reader) {
  const auto& isInterrupted = static_cast<SqlReader*>(reader)->isInterrupted_;
  return isInterrupted && isInterrupted() ? 1 : 0;
}

bool isWholeStatement(const std::string& text) { return sqlite3_complete(text.c_str()) != 0; }

}  // namespace tonewerk
