// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/LedgerTable.h"

#include <string>
#include <string_view>

namespace tonewerk {
namespace {

std::string_view textOf(SendingFacts::Outcome outcome) {
  switch (outcome) {
    case SendingFacts::Outcome::kDelivered:
      return "delivered";
    case SendingFacts::Outcome::kKept:
      return "kept";
    case SendingFacts::Outcome::kSplit:
      return "split";
    case SendingFacts::Outcome::kDropped:
      break;
  }
  return "dropped";
}

}  // namespace

LedgerTable::LedgerTable(SqliteDatabase& database, std::int64_t floor) {
  database.addRows("new_sending", 10, *this);
  const std::string columns =
      "sent_at, endpoint, signal, records, bytes, status, outcome, rejected, problem, user_id";
  const std::string values = "c0, c1, c2, c3, c4, c5, c6, c7, c8, c9 FROM new_sending";
  insertRows_ = database.prepare("INSERT INTO sending_row (" + columns + ") SELECT " + values);
  if (floor == 0) return;
  insertAboveFloor_ = database.prepare("INSERT INTO sending_row (id, " + columns + ") SELECT " +
                                       std::to_string(floor) + " + row_number() OVER (), " + values);
}

bool LedgerTable::insert(const StoreBatch& batch) {
  if (batch.sendings().empty()) return true;
  batch_ = &batch;
  const bool inserted = (insertAboveFloor_ ? insertAboveFloor_ : insertRows_).run();
  insertAboveFloor_ = {};
  batch_ = nullptr;
  return inserted;
}

std::size_t LedgerTable::rowCount() const { return batch_ == nullptr ? 0 : batch_->sendings().size(); }

void LedgerTable::read(std::size_t row, int column, SqliteCell& cell) const {
  const StoreBatch::Sending& sending = batch_->sendings()[row];
  const SendingFacts& facts = sending.facts;
  switch (column) {
    case 0:
      return cell.set(facts.sentAt);
    case 1:
      return cell.set(batch_->text(sending.endpoint));
    case 2:
      return cell.set(facts.signal);
    case 3:
      return cell.set(static_cast<std::int64_t>(facts.records));
    case 4:
      return cell.set(static_cast<std::int64_t>(facts.bytes));
    case 5:
      return facts.status ? cell.set(static_cast<std::int64_t>(*facts.status)) : void();
    case 6:
      return cell.set(textOf(facts.outcome));
    case 7:
      return facts.rejected ? cell.set(static_cast<std::int64_t>(*facts.rejected)) : void();
    case 8:
      return sending.problem.size > 0 ? cell.set(batch_->text(sending.problem)) : void();
    default:
      return cell.setUser(sending.user);
  }
}

}  // namespace tonewerk
