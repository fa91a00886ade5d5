// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/StoreFacts.h"

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <system_error>
#include <unistd.h>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreFile.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kPatience{5};
constexpr double kHour = 3600.0;
constexpr double kDay = 24 * kHour;

// The rows are in the order of their times, but for jumps of the clock, so only the first and the last of
// each table are read.
constexpr const char* kTimes =
    "WITH times (t) AS (SELECT * FROM (SELECT recorded_at FROM analytics_row ORDER BY id LIMIT 1) UNION ALL "
    "SELECT * FROM (SELECT recorded_at FROM analytics_row ORDER BY id DESC LIMIT 1) UNION ALL "
    "SELECT * FROM (SELECT posted_at FROM metric ORDER BY id LIMIT 1) UNION ALL "
    "SELECT * FROM (SELECT posted_at FROM metric ORDER BY id DESC LIMIT 1) UNION ALL "
    "SELECT * FROM (SELECT recorded_at FROM power_event ORDER BY id LIMIT 1) UNION ALL "
    "SELECT * FROM (SELECT recorded_at FROM power_event ORDER BY id DESC LIMIT 1)) "
    "SELECT min(t), max(t) FROM times";

std::uint64_t sizeOf(const std::string& path) {
  std::error_code error;
  const std::uintmax_t size = std::filesystem::file_size(path, error);
  return error ? 0 : size;
}

// Without permission to write in the directory, a file that nobody has open can only be read as it is.
bool openToRead(SqliteDatabase& database, const std::string& path) {
  std::error_code error;
  if (database.open(path, SqliteDatabase::Mode::kReadOnly, kPatience) &&
      database.number("PRAGMA user_version"))
    return true;
  if (std::filesystem::exists(path + "-wal", error)) return false;
  database.close();
  return database.open(path, SqliteDatabase::Mode::kImmutable, kPatience) &&
         database.number("PRAGMA user_version").has_value();
}

}  // namespace

std::optional<double> StoreFacts::bytesPerDay(double now) const {
  if (!oldestAt || now - *oldestAt < kHour) return std::nullopt;
  return static_cast<double>(bytes) / ((now - *oldestAt) / kDay);
}

StoreFacts readStoreFacts(const std::string& directory) {
  const StoreFile file = storeFileIn(directory);
  StoreFacts facts;
  facts.path = file.path;
  facts.newerSchema = file.newerSchema;
  std::error_code error;
  facts.exists = std::filesystem::exists(facts.path, error);
  facts.hasDamagedCopy = std::filesystem::exists(facts.path + ".corrupt", error);
  if (::access(facts.path.c_str(), R_OK) != 0 && errno != ENOENT) {
    facts.problem = std::error_code(errno, std::generic_category()).message();
    facts.isForbidden = errno == EACCES;
    return facts;
  }
  if (!facts.exists) return facts;
  facts.bytes = sizeOf(facts.path) + sizeOf(facts.path + "-wal");
  SqliteDatabase database;
  if (!openToRead(database, facts.path)) {
    facts.problem = database.problem();
    return facts;
  }
  SqliteStatement times = database.prepare(kTimes);
  // A store of an earlier daemon has other tables; the next start of the daemon migrates it.
  if (times && times.step() == SqliteStatement::Step::kRow && !times.isNull(0)) {
    facts.oldestAt = times.number(0);
    facts.newestAt = times.number(1);
  } else if (database.isCorrupt()) {
    facts.problem = database.problem();
  }
  return facts;
}

std::optional<std::int64_t> messagesDroppedByPrograms(const StoreFacts& store, double since) {
  SqliteDatabase database;
  if (!store.exists || !store.problem.empty() || !openToRead(database, store.path)) return std::nullopt;
  SqliteStatement sum = database.prepare(
      "SELECT coalesce(sum(json_extract(payload, '$.twreporting_dropped')), 0) FROM analytics_row WHERE "
      "recorded_at >= ?1 AND instr(payload, '\"twreporting_dropped\"') > 0 AND json_valid(payload)");
  if (!sum) return std::nullopt;
  sum.bind(1, since);
  return sum.firstNumber();
}

}  // namespace tonewerk
