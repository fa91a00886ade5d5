// SPDX-License-Identifier: Apache-2.0
#pragma once

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
  [[nodiscard]] bool insert(const AnalyticsRow& row);

 private:
  // Combinations of names are remembered up to this number, then anew.
  static constexpr std::size_t kMaxKnown = 4096;

  struct NamesHash {
    std::size_t operator()(const EventNames& names) const {
      return names.first.hash() * 31 + names.second.hash();
    }
  };

  [[nodiscard]] std::optional<std::int64_t> nameSet(const EventNames& names);
  [[nodiscard]] std::optional<std::int64_t> findNameSet(const EventNames& names, bool& failed);
  [[nodiscard]] std::optional<std::int64_t> insertNameSet(const EventNames& names);

  SqliteDatabase& database_;
  const JsonService& json_;
  SqliteStatement insertRow_;
  std::unordered_map<EventNames, std::int64_t, NamesHash> known_;
};

}  // namespace tonewerk
