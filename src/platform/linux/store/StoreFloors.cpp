// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreFloors.h"

#include <cstddef>

namespace tonewerk {

std::string storeFloorTable() {
  return "CREATE TABLE IF NOT EXISTS row_floor (name TEXT PRIMARY KEY, id INTEGER NOT NULL) WITHOUT ROWID";
}

std::optional<StoreRowIds> readStoreFloors(SqliteDatabase& database) {
  StoreRowIds floors{};
  const auto tables = database.number("SELECT count(*) FROM sqlite_master WHERE name = 'row_floor'");
  if (!tables) return std::nullopt;
  if (*tables == 0) return floors;
  for (std::size_t at = 0; at < floors.size(); ++at) {
    const std::string name(kStoreTables[at].name);
    const auto newest = database.number("SELECT coalesce(max(id), 0) FROM " + name);
    const auto floor =
        database.number("SELECT coalesce(max(id), 0) FROM row_floor WHERE name = '" + name + "'");
    if (!newest || !floor) return std::nullopt;
    if (*floor > *newest) floors[at] = *floor;
  }
  return floors;
}

}  // namespace tonewerk
