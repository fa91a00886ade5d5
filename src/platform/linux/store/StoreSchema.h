// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

namespace tonewerk {

// The report store's file with its tables and views. docs/store.md explains them to those who query them.

inline constexpr std::string_view kStoreFileName = "reports.db";
inline constexpr std::int64_t kStoreSchemaVersion = 1;

// An analytics event's identifier is its row's identifier times this, plus the position of its name in the
// row.
inline constexpr std::int64_t kStoreNamesPerRow = 2;

// A table whose new rows have ever higher identifiers.
struct StoreTable {
  std::string_view name;
  std::string_view time;   // the column with the time of recording
  std::string_view bytes;  // an expression: the size of what may be large in a row
  std::string_view empty;  // an assignment that removes that from a row
};

inline constexpr std::array<StoreTable, 5> kStoreTables{{
    {"analytics_row", "recorded_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
    {"metric", "posted_at", "length(record)", "record = x''"},
    {"power_event", "recorded_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
    {"rtc_session", "started_at", "length(CAST(session_info AS BLOB)) + length(CAST(user_info AS BLOB))",
     "session_info = '{}', user_info = '{}'"},
    {"rtc_message", "sent_at", "length(CAST(payload AS BLOB))", "payload = '{}'"},
}};

// The SQL that makes the schema in an empty database, user_version included, in one transaction.
std::string storeSchema();

}  // namespace tonewerk
