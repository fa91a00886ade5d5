// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/PowerTable.h"

#include <string>

namespace tonewerk {

PowerTable::PowerTable(SqliteDatabase& database, std::int64_t floor) {
  database.addRows("new_power_event", 5, *this);
  const std::string columns = "recorded_at, event_group, name, payload, user_id";
  const std::string values = "c0, c1, c2, c3, c4 FROM new_power_event";
  insertRows_ = database.prepare("INSERT INTO power_event (" + columns + ") SELECT " + values);
  if (floor == 0) return;
  insertAboveFloor_ = database.prepare("INSERT INTO power_event (id, " + columns + ") SELECT " +
                                       std::to_string(floor) + " + row_number() OVER (), " + values);
}

bool PowerTable::insert(const StoreBatch& batch) {
  if (batch.power().empty()) return true;
  batch_ = &batch;
  const bool inserted = (insertAboveFloor_ ? insertAboveFloor_ : insertRows_).run();
  insertAboveFloor_ = {};
  batch_ = nullptr;
  return inserted;
}

std::size_t PowerTable::rowCount() const { return batch_ == nullptr ? 0 : batch_->power().size(); }

void PowerTable::read(std::size_t row, int column, SqliteCell& cell) const {
  const StoreBatch::Power& event = batch_->power()[row];
  switch (column) {
    case 0:
      return cell.set(event.recordedAt);
    case 1:
      return cell.set(event.group);
    case 2:
      return cell.set(batch_->text(event.name));
    case 3:
      return cell.set(batch_->text(event.payload));
    default:
      return cell.setUser(event.user);
  }
}

}  // namespace tonewerk
