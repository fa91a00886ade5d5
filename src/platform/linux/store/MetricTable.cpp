// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/MetricTable.h"

namespace tonewerk {

MetricTable::MetricTable(SqliteDatabase& database) {
  database.addRows("new_metric", 4, *this);
  insertRows_ = database.prepare(
      "INSERT INTO metric (posted_at, identifier, record, user_id) SELECT c0, c1, c2, c3 FROM new_metric");
}

bool MetricTable::insert(const StoreBatch& batch) {
  if (batch.metrics().empty()) return true;
  batch_ = &batch;
  const bool inserted = insertRows_.run();
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
