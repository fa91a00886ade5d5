// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/linux/store/JsonCut.h"

namespace tonewerk {

// The report store's file with its tables and views. docs/store.md explains them to those who query them.

inline constexpr std::string_view kStoreFileName = "reports.db";
inline constexpr std::int64_t kStoreSchemaVersion = 2;

// An analytics event's identifier is its row's identifier times this, plus the position of its name in the
// row.
inline constexpr std::int64_t kStoreNamesPerRow = 2;

// What analytics_row.rtc_bits says of a row that is a message, too. Each column of a row costs the writer
// time, so four numbers are in one: from the highest bit on, 23 bits for the place of the hidden bytes in the
// payload, 8 bits for their number, 16 bits each for category and type.
constexpr std::int64_t rtcBits(std::uint16_t category, std::uint16_t type, const JsonCut& hidden) {
  return static_cast<std::int64_t>(std::uint64_t{hidden.begin} << 40 | std::uint64_t{hidden.size} << 32 |
                                   std::uint64_t{category} << 16 | type);
}
// What has room there.
inline constexpr std::size_t kMaxHiddenPlace = (std::size_t{1} << 23) - 1;
inline constexpr std::size_t kMaxHiddenBytes = 255;

// A table whose new rows have ever higher identifiers.
struct StoreTable {
  std::string_view name;
  std::string_view time;   // the column with the time of recording
  std::string_view bytes;  // an expression: the size of what may be large in a row
  std::string_view empty;  // an assignment that removes that from a row
};

inline constexpr std::array<StoreTable, 5> kStoreTables{{
    {"analytics_row", "recorded_at", "length(CAST(payload AS BLOB))",
     "payload = '{}', rtc_bits = rtc_bits & 0xffffffff"},
    {"metric", "posted_at", "length(record)", "record = x''"},
    {"power_event", "recorded_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
    {"rtc_session", "started_at", "length(CAST(session_info AS BLOB)) + length(CAST(user_info AS BLOB))",
     "session_info = '{}', user_info = '{}'"},
    {"rtc_row", "sent_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
}};

// An identifier for each of kStoreTables.
using StoreRowIds = std::array<std::int64_t, kStoreTables.size()>;

// What a row counts beside its `bytes`: about the bytes of its identifier and its other columns.
inline constexpr std::int64_t kStoreRowBytes = 32;

// The SQL that makes the schema in an empty database, user_version included, in one transaction.
std::string storeSchema();

// The SQL that turns a database of version 1 into one of this version, in one transaction that writes few
// pages. In version 1 rtc_message was a table, and analytics_row had no columns for messages.
std::string storeMigration();

// The SQL that gives the tables of an earlier file of this version the column with the user, in one
// transaction that writes few pages. Programs that do not know the column can read and write the file.
std::string storeUserColumns();

// The SQL that makes the tables of StoreAge in an earlier file of this version, in one transaction.
std::string storeAgeTables();

}  // namespace tonewerk
