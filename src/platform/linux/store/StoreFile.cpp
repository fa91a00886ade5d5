// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreFile.h"

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <system_error>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::chrono::milliseconds kPatience{500};

// The schema version of a file; none when it cannot be read. Only SQLite opens and closes the file: this
// process may have other connections to it, and whoever else closes a descriptor of it takes their locks off.
std::optional<std::int64_t> schemaVersionOf(const std::string& path) {
  std::error_code error;
  const std::uintmax_t logBytes = std::filesystem::file_size(path + "-wal", error);
  // The version may be in the write-ahead log. Without one, a connection would make the side files.
  const bool hasLog = !error && logBytes > 0;
  SqliteDatabase database;
  const auto mode = hasLog ? SqliteDatabase::Mode::kReadOnly : SqliteDatabase::Mode::kImmutable;
  if (!database.open(path, mode, kPatience)) return std::nullopt;
  return database.number("PRAGMA user_version");
}

}  // namespace

StoreFile storeFileIn(const std::string& directory) {
  const std::string path = directory + "/" + std::string(kStoreFileName);
  const std::optional<std::int64_t> version = schemaVersionOf(path);
  if (!version || *version <= kStoreSchemaVersion) return {path, std::nullopt};
  return {directory + "/" + std::string(kStoreFileNameBesideNewer), version};
}

}  // namespace tonewerk
