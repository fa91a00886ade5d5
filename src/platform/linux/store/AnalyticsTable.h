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

// Writes the analytics rows and their names into an open report store. Used on the writer's thread, within
// its transactions. After a transaction was undone, a new object is needed: this one may remember names as
// stored that are not.
class AnalyticsTable {
 public:
  // `database` and `json` outlive it. Prepares its statement. Whether that succeeded shows in the first
  // insert().
  AnalyticsTable(SqliteDatabase& database, const JsonService& json);

  // False on failure. The database then has the problem.
  [[nodiscard]] bool insert(const AnalyticsRow& row);

 private:
  // The identifiers of so many name sets are remembered. When there are more, all are forgotten.
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
