// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/PowerTable.h"

#include <string>

#include "platform/JsonService.h"

namespace tonewerk {

PowerTable::PowerTable(SqliteDatabase& database, const JsonService& json)
    : json_(json),
      insertRow_(database.prepare(
          "INSERT INTO power_event (recorded_at, event_group, name, payload) VALUES (?1, ?2, ?3, ?4)")) {}

bool PowerTable::insert(const PowerRow& row) {
  const std::string payload = json_.compact(row.payload);
  insertRow_.bind(1, row.recordedAt);
  insertRow_.bind(2, row.group);
  insertRow_.bind(3, row.name.view());
  insertRow_.bind(4, payload);
  return insertRow_.run();
}

}  // namespace tonewerk
