// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <unordered_map>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"

namespace tonewerk {

class JsonService;

// The analytics rows and their names in an open report store. The writer's thread, within its transactions.
// Not to be used again after a transaction was undone: it remembers names as stored that then are not.
class AnalyticsTable {
 public:
  // Both outlive it. Prepares its statements; whether that went well shows in the first insert().
  AnalyticsTable(SqliteDatabase& database, const JsonService& json);

  // False on failure; the database says which.
  bool insert(const AnalyticsRow& row);

 private:
  // Combinations of names are remembered up to this number, then anew.
  static constexpr std::size_t kMaxKnown = 4096;

  struct Names {
    std::array<SharedString, AnalyticsRow::kMaxNames> names;
    friend bool operator==(const Names&, const Names&) = default;
  };
  struct NamesHash {
    std::size_t operator()(const Names& key) const { return key.names[0].hash() * 31 + key.names[1].hash(); }
  };

  std::optional<std::int64_t> nameSet(const Names& names);
  std::optional<std::int64_t> findNameSet(const Names& names, bool& failed);
  std::optional<std::int64_t> insertNameSet(const Names& names);

  SqliteDatabase& database_;
  const JsonService& json_;
  SqliteStatement insertRow_;
  std::unordered_map<Names, std::int64_t, NamesHash> known_;
};

}  // namespace tonewerk
