// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/StoreReader.h"

#include <chrono>
#include <filesystem>
#include <system_error>

#include "platform/linux/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kPatience{5};

// On the tables below the view: there, what comes after an identifier is found by key.
std::string eventQuery(const EventFilter& filter) {
  std::string sql =
      "SELECT r.id * ?1 + n.position AS id, r.recorded_at AS recorded_at, n.name AS name, r.payload AS "
      "payload"
      " FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set"
      " WHERE r.id >= ?2 / ?1 AND r.id * ?1 + n.position > ?2";
  if (filter.name) sql += " AND n.name GLOB ?3";
  if (filter.since) sql += " AND r.recorded_at >= ?4";
  if (filter.until) sql += " AND r.recorded_at <= ?5";
  if (!filter.limit) return sql + " ORDER BY r.id, n.position";
  return "SELECT * FROM (" + sql + " ORDER BY r.id DESC, n.position DESC LIMIT ?6) ORDER BY id";
}

}  // namespace

StoreReader::Outcome StoreReader::open(const std::string& directory) {
  path_ = directory + "/" + std::string(kStoreFileName);
  std::error_code error;
  if (!std::filesystem::exists(path_, error)) {
    if (error) return fail(error.message());
    problem_ = path_ + ": there is no such file";
    return Outcome::kNoStore;
  }
  const Outcome outcome = openAs(SqliteDatabase::Mode::kReadOnly);
  // Reading needs a side file, which somebody who may not write to the directory cannot make. A writer has
  // one there; without a writer the file does not change either.
  if (outcome != Outcome::kFailed || std::filesystem::exists(path_ + "-wal", error)) return outcome;
  return openAs(SqliteDatabase::Mode::kImmutable);
}

bool StoreReader::readEvents(const EventFilter& filter,
                             const std::function<void(const StoredEvent& event)>& take) {
  SqliteStatement select = database_.prepare(eventQuery(filter));
  select.bind(1, kStoreNamesPerRow);
  select.bind(2, filter.afterId);
  if (filter.name) select.bind(3, std::string_view(*filter.name));
  if (filter.since) select.bind(4, *filter.since);
  if (filter.until) select.bind(5, *filter.until);
  if (filter.limit) select.bind(6, *filter.limit);
  for (;;) {
    switch (select.step()) {
      case SqliteStatement::Step::kRow:
        take({select.integer(0), select.number(1), select.text(2), select.text(3)});
        break;
      case SqliteStatement::Step::kDone:
        return true;
      case SqliteStatement::Step::kFailed:
        fail(database_.problem());
        return false;
    }
  }
}

StoreReader::Outcome StoreReader::openAs(SqliteDatabase::Mode mode) {
  if (!database_.open(path_, mode, kPatience)) return fail(database_.problem());
  const auto version = database_.number("PRAGMA user_version");
  if (!version) return fail(database_.problem());
  if (*version > kStoreSchemaVersion) return fail("it was made by a newer version");
  if (*version == 0) {
    problem_ = path_ + ": nothing has been stored yet";
    return Outcome::kNoStore;
  }
  return Outcome::kDone;
}

StoreReader::Outcome StoreReader::fail(const std::string& problem) {
  problem_ = path_ + ": " + problem;
  return Outcome::kFailed;
}

}  // namespace tonewerk
