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
// The store's name where a newer version made the file of the usual name. It has the schema's version.
inline constexpr std::string_view kStoreFileNameBesideNewer = "reports.3.db";
inline constexpr std::int64_t kStoreSchemaVersion = 3;

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

// What the row of a session's life counts: its names are short, and change while it lives.
inline constexpr std::int64_t kStoreSessionBytes = 128;

inline constexpr std::array<StoreTable, 7> kStoreTables{{
    {"analytics_row", "recorded_at", "length(CAST(payload AS BLOB))",
     "payload = '{}', rtc_bits = rtc_bits & 0xffffffff"},
    {"metric", "posted_at", "length(record)", "record = x''"},
    {"power_event", "recorded_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
    {"rtc_session", "started_at", "length(CAST(session_info AS BLOB)) + length(CAST(user_info AS BLOB))",
     "session_info = '{}', user_info = '{}'"},
    {"rtc_row", "sent_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
    {"session_row", "started_at", "128", "application = NULL, process = NULL"},
    {"sending_row", "sent_at", "length(CAST(endpoint AS BLOB)) + length(CAST(coalesce(problem, '') AS BLOB))",
     "problem = NULL"},
}};

static_assert(kStoreSessionBytes == 128 && kStoreTables[5].bytes == "128", "they say the same");

// The rows of sending_row that are kept beside the newest, whatever the age of rows and the size of the file
// may be. An endpoint that is away gets a request every half a minute, which makes 86,400 in thirty days.
inline constexpr std::int64_t kStoreSendings = 100'000;

// An identifier for each of kStoreTables.
using StoreRowIds = std::array<std::int64_t, kStoreTables.size()>;

// The place of a table in kStoreTables.
consteval std::size_t storeTableIndex(std::string_view name) {
  std::size_t at = 0;
  while (kStoreTables[at].name != name) ++at;
  return at;
}

// What a row counts beside its `bytes`: about the bytes of its identifier and its other columns.
inline constexpr std::int64_t kStoreRowBytes = 32;

// The settings of a new file. They come before anything else is in it; later they would take effect only when
// the whole file is rewritten.
std::string storeFileSettings();

// The SQL that makes the schema in an empty database, user_version included, in one transaction.
std::string storeSchema();

// The SQL that gives messages' names that lack them the category and the type, which are in the framework's
// name.
std::string storeKindsOfNames();

// The SQL that gives a database of this version the table of sendings, in one transaction. The first ones of
// this version lack it.
std::string storeSendingsMigration();

// What a database of an earlier version has.
struct EarlierStore {
  std::int64_t version = 0;
  bool hasUsers = false;  // the columns for users, which the first files of version 2 lack
  bool hasAges = false;   // the tables of StoreAge, which they lack, too
};

// The SQL that turns such a database into one of this version, in one transaction. It writes few pages, and
// reads the rows once.
//
//   version 1 -> 2   rtc_message was a table; analytics_row gets columns for messages
//   version 2 -> 3   rows know their session, and summaries when their stretch began and ended
std::string storeMigration(const EarlierStore& store);

}  // namespace tonewerk
