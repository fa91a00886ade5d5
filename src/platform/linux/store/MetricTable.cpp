// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/MetricTable.h"

namespace tonewerk {

MetricTable::MetricTable(SqliteDatabase& database)
    : insertRow_(database.prepare("INSERT INTO metric (posted_at, identifier, record) VALUES (?1, ?2, ?3)")) {
}

bool MetricTable::insert(const MetricRow& row) {
  insertRow_.bind(1, row.postedAt);
  insertRow_.bind(2, static_cast<std::int64_t>(row.identifier));
  insertRow_.bindBytes(3, row.record);
  return insertRow_.run();
}

}  // namespace tonewerk
