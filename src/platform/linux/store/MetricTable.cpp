// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/MetricTable.h"

#include <string>

namespace tonewerk {

MetricTable::MetricTable(SqliteDatabase& database, std::int64_t floor) {
  database.addRows("new_metric", 4, *this);
  const std::string columns = "posted_at, identifier, record, user_id";
  const std::string values = "c0, c1, c2, c3 FROM new_metric";
  insertRows_ = database.prepare("INSERT INTO metric (" + columns + ") SELECT " + values);
  if (floor == 0) return;
  insertAboveFloor_ = database.prepare("INSERT INTO metric (id, " + columns + ") SELECT " +
                                       std::to_string(floor) + " + row_number() OVER (), " + values);
}

bool MetricTable::insert(const StoreBatch& batch) {
  if (batch.metrics().empty()) return true;
  batch_ = &batch;
  const bool inserted = (insertAboveFloor_ ? insertAboveFloor_ : insertRows_).run();
  insertAboveFloor_ = {};
  batch_ = nullptr;
  return inserted;
}

std::size_t MetricTable::rowCount() const { return batch_ == nullptr ? 0 : batch_->metrics().size(); }

void MetricTable::read(std::size_t row, int column, SqliteCell& cell) const {
  const StoreBatch::Metric& metric = batch_->metrics()[row];
  switch (column) {
    case 0:
      return cell.set(metric.postedAt);
    case 1:
      return cell.set(static_cast<std::int64_t>(metric.identifier));
    case 2:
      return cell.setBytes(batch_->text(metric.record));
    default:
      return cell.setUser(metric.user);
  }
}

}  // namespace tonewerk
