// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

namespace tonewerk {

// The report store's file, its tables and views. docs/store.md explains them to those who query them.

inline constexpr std::string_view kStoreFileName = "reports.db";
inline constexpr std::int64_t kStoreSchemaVersion = 1;

// An analytics event's identifier is its row's times this, plus the place of its name among the row's names.
inline constexpr std::int64_t kStoreNamesPerRow = 2;

// A table that grows by rows with ever higher identifiers, and its column that says when a row was recorded.
struct StoreTable {
  std::string_view name;
  std::string_view time;
};

inline constexpr std::array<StoreTable, 5> kStoreTables{{
    {"analytics_row", "recorded_at"},
    {"metric", "posted_at"},
    {"power_event", "recorded_at"},
    {"rtc_session", "started_at"},
    {"rtc_message", "sent_at"},
}};

// Makes all of it in an empty database, user_version included. One transaction.
std::string storeSchema();

}  // namespace tonewerk
