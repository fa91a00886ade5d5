// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/LifeTable.h"

#include <string_view>

namespace tonewerk {
namespace {

void bindName(SqliteStatement& statement, int parameter, std::string_view name) {
  if (name.empty()) {
    statement.bindNull(parameter);
  } else {
    statement.bind(parameter, name);
  }
}

}  // namespace

LifeTable::LifeTable(SqliteDatabase& database, FileNumbers file, std::int64_t floor)
    : database_(database),
      file_(file),
      floor_(floor),
      insert_(
          database.prepare("INSERT INTO session_row (id, started_at, request, reporter_id, service, user_id)"
                           " VALUES (?6, ?1, ?2, ?3, ?4, ?5)")),
      change_(database.prepare(
          "UPDATE session_row SET application = ?2, process = ?3, ended_at = ?4, ending = ?5, messages = ?6,"
          " redundant_messages = ?7, active_seconds = ?8, overloads = ?9 WHERE id = ?1")) {}

LifeTable::~LifeTable() {
  for (auto at = uncommitted_.rbegin(); at != uncommitted_.rend(); ++at) at->first->place = at->second;
}

bool LifeTable::write(const StoreBatch& batch) {
  newRows_.clear();
  for (std::size_t at = 0; at < batch.lives().size(); ++at) {
    if (!place(batch.lives()[at], batch.lifeUsers()[at])) return false;
  }
  const std::span<const StoreBatch::Session> rows = batch.lifeRows();
  for (std::size_t at = 0; at < rows.size(); ++at) {
    // A short life begins and ends in one batch. Its end says all that its beginning does.
    if (at + 1 < rows.size() && rows[at + 1].life == rows[at].life) continue;
    if (!change(batch, rows[at])) return false;
  }
  return true;
}

bool LifeTable::endInterrupted(SqliteDatabase& database) {
  return database.run(
      "UPDATE session_row SET ending = 'interrupted', ended_at = max(started_at, coalesce("
      "(SELECT recorded_at FROM analytics_row ORDER BY id DESC LIMIT 1), started_at)) WHERE ended_at IS "
      "NULL");
}

bool LifeTable::place(const std::shared_ptr<SessionLife>& life, std::uint32_t user) {
  if (life->place.file == file_.own) return true;
  if (life->place.file >= file_.firstSaved) return placeSaved(life, user);
  const std::optional<std::int64_t> found = find(life->beginning);
  if (!found) return false;
  if (*found == 0) {
    if (!placeNew(life, user, 0)) return false;
    if (rowsFrom_) rows_[{life->beginning.request, life->beginning.reporterID}] = life->place.identifier;
    return true;
  }
  uncommitted_.emplace_back(life, life->place);
  life->place = {*found, file_.own};
  return true;
}

// When the file has lost its newest rows without a trace, another life may have got the identifier.
bool LifeTable::placeSaved(const std::shared_ptr<SessionLife>& life, std::uint32_t user) {
  SqliteStatement select =
      database_.prepare("SELECT reporter_id = ?2 AND started_at = ?3 FROM session_row WHERE id = ?1");
  select.bind(1, life->place.identifier);
  select.bind(2, life->beginning.reporterID);
  select.bind(3, life->beginning.at);
  const SqliteStatement::Step step = select.step();
  if (step == SqliteStatement::Step::kFailed) return false;
  if (step == SqliteStatement::Step::kDone) return placeNew(life, user, life->place.identifier);
  const bool isIts = select.integer(0) == 1;
  select.reset();
  if (!isIts) return placeNew(life, user, 0);
  life->place.file = file_.own;
  return true;
}

bool LifeTable::placeNew(const std::shared_ptr<SessionLife>& life, std::uint32_t user,
                         std::int64_t identifier) {
  if (!insert(life->beginning, user, identifier)) return false;
  uncommitted_.emplace_back(life, life->place);
  life->place = {database_.insertedRow(), file_.own};
  return true;
}

std::optional<std::int64_t> LifeTable::find(const SessionBeginning& beginning) {
  if (beginning.request == 0) return 0;
  if (!newestRequest_) {
    const auto newest = database_.number("SELECT coalesce(max(request), 0) FROM session_row");
    if (!newest) return std::nullopt;
    newestRequest_ = static_cast<std::uint64_t>(*newest);
  }
  if (beginning.request > *newestRequest_) {
    newestRequest_ = beginning.request;
    rows_.clear();
    rowsFrom_.reset();
    return 0;
  }
  if ((!rowsFrom_ || beginning.request < *rowsFrom_) && !readRowsFrom(beginning.request)) return std::nullopt;
  const auto found = rows_.find({beginning.request, beginning.reporterID});
  return found == rows_.end() ? 0 : found->second;
}

bool LifeTable::readRowsFrom(std::uint64_t request) {
  rows_.clear();
  rowsFrom_ = request;
  SqliteStatement select =
      database_.prepare("SELECT request, reporter_id, id FROM session_row WHERE request >= ?1");
  select.bind(1, static_cast<std::int64_t>(request));
  SqliteStatement::Step step = SqliteStatement::Step::kDone;
  while ((step = select.step()) == SqliteStatement::Step::kRow) {
    rows_[{static_cast<std::uint64_t>(select.integer(0)), select.integer(1)}] = select.integer(2);
  }
  return step == SqliteStatement::Step::kDone;
}

bool LifeTable::insert(const SessionBeginning& beginning, std::uint32_t user, std::int64_t identifier) {
  insert_.bind(1, beginning.at);
  insert_.bindUnlessZero(2, static_cast<std::int64_t>(beginning.request));
  insert_.bind(3, beginning.reporterID);
  bindName(insert_, 4, beginning.service.view());
  insert_.bindUser(5, user);
  const bool isNew = identifier == 0;
  if (isNew && floor_ > 0) identifier = floor_ + 1;
  insert_.bindUnlessZero(6, identifier);
  if (!insert_.run()) return false;
  if (isNew) floor_ = 0;
  newRows_.push_back(user);
  return true;
}

bool LifeTable::change(const StoreBatch& batch, const StoreBatch::Session& row) {
  change_.bind(1, batch.lives()[row.life]->place.identifier);
  bindName(change_, 2, batch.text(row.application));
  bindName(change_, 3, batch.text(row.process));
  if (row.end) {
    change_.bind(4, row.end->at);
    change_.bind(5, textOf(row.end->ending));
    change_.bind(6, static_cast<std::int64_t>(row.end->messages));
    change_.bind(7, static_cast<std::int64_t>(row.end->redundantMessages));
    change_.bind(8, row.end->activeSeconds);
    change_.bind(9, static_cast<std::int64_t>(row.end->overloads));
  } else {
    for (int parameter = 4; parameter <= 9; ++parameter) change_.bindNull(parameter);
  }
  if (!change_.run()) return false;
  if (database_.changes() > 0) return true;
  // The file has lost the row. Events that are still there name it.
  const std::shared_ptr<SessionLife>& life = batch.lives()[row.life];
  return insert(life->beginning, batch.lifeUsers()[row.life], life->place.identifier) && change_.run();
}

}  // namespace tonewerk
