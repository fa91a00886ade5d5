// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreFile.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <string_view>
#include <system_error>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {
namespace {

constexpr std::string_view kMagic{"SQLite format 3\0", 16};
constexpr std::size_t kVersionAt = 60;  // user_version in the file's header, highest byte first
constexpr std::chrono::milliseconds kPatience{500};

std::optional<std::int64_t> versionInHeader(const std::string& path) {
  std::array<char, kVersionAt + 4> header{};
  std::ifstream file(path, std::ios::binary);
  if (!file.read(header.data(), header.size())) return std::nullopt;
  if (std::string_view(header.data(), kMagic.size()) != kMagic) return std::nullopt;
  std::uint32_t version = 0;
  for (std::size_t at = kVersionAt; at < header.size(); ++at) {
    version = version << 8 | static_cast<unsigned char>(header[at]);
  }
  return static_cast<std::int32_t>(version);
}

// The schema version of a file; none when it cannot be read.
std::optional<std::int64_t> schemaVersionOf(const std::string& path) {
  std::error_code error;
  const std::uintmax_t logBytes = std::filesystem::file_size(path + "-wal", error);
  if (error || logBytes == 0) return versionInHeader(path);
  // The header may be in the write-ahead log. A connection that only reads leaves both as they are.
  SqliteDatabase database;
  if (!database.open(path, SqliteDatabase::Mode::kReadOnly, kPatience)) return std::nullopt;
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
