// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreMarks.h"

#include <chrono>
#include <filesystem>

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kPatience{5};

}  // namespace

std::optional<StoreMarks> readStoreMarks(const std::string& path, std::string& problem) {
  StoreMarks marks;
  std::error_code error;
  if (!std::filesystem::exists(path, error)) return marks;
  SqliteDatabase database;
  const auto failed = [&] {
    problem = database.problem();
    return std::nullopt;
  };
  if (!database.open(path, SqliteDatabase::Mode::kReadWrite, kPatience)) return failed();
  const auto tables =
      database.number("SELECT count(*) FROM sqlite_master WHERE type = 'table' AND name = 'journal_mark'");
  if (!tables) return failed();
  if (*tables == 0) return marks;
  SqliteStatement all = database.prepare("SELECT user_id, sequence, row FROM journal_mark");
  SqliteStatement::Step step = all.step();
  for (; step == SqliteStatement::Step::kRow; step = all.step()) {
    marks[static_cast<std::uint32_t>(all.integer(0))] = {static_cast<std::uint64_t>(all.integer(1)),
                                                         static_cast<std::uint32_t>(all.integer(2))};
  }
  if (step == SqliteStatement::Step::kFailed) return failed();
  return marks;
}

std::string storeMarkTable() {
  return "CREATE TABLE IF NOT EXISTS journal_mark ("
         "user_id INTEGER PRIMARY KEY, sequence INTEGER NOT NULL, row INTEGER NOT NULL)";
}

StoreMarkTable::StoreMarkTable(SqliteDatabase& database) {
  // A failure shows when the statement is used.
  (void)database.run(storeMarkTable());
  set_ = database.prepare("INSERT OR REPLACE INTO journal_mark (user_id, sequence, row) VALUES (?1, ?2, ?3)");
}

bool StoreMarkTable::write(const StoreMarks& marks) {
  for (const auto& [user, row] : marks) {
    set_.bind(1, static_cast<std::int64_t>(user));
    set_.bind(2, static_cast<std::int64_t>(row.sequence));
    set_.bind(3, static_cast<std::int64_t>(row.number));
    if (!set_.run()) return false;
  }
  return true;
}

}  // namespace tonewerk
