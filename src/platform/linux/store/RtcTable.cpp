// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/RtcTable.h"

#include <string>

#include "platform/JsonService.h"

namespace tonewerk {

RtcTable::RtcTable(SqliteDatabase& database, const JsonService& json, std::uint64_t fileNumber,
                   std::int64_t floor)
    : database_(database),
      json_(json),
      fileNumber_(fileNumber),
      floor_(floor),
      insertSession_(
          database.prepare("INSERT INTO rtc_session (id, started_at, session_info, user_info, user_id)"
                           " VALUES (?5, ?1, ?2, ?3, ?4)")) {
  database.addRows("new_rtc_row", 7, *this);
  insertMessages_ = database.prepare(
      "INSERT INTO rtc_row (id, sent_at, rtc_session, category, type, payload, user_id)"
      " SELECT c0, c1, c2, c3, c4, c5, c6 FROM new_rtc_row");
}

RtcTable::~RtcTable() {
  for (const auto& session : uncommitted_) session->place = {};
}

bool RtcTable::insertSessions(const StoreBatch& batch) {
  newSessions_.clear();
  for (std::size_t at = 0; at < batch.sessions().size(); ++at) {
    const auto& session = batch.sessions()[at];
    if (!has(*session) && !insertSession(session, batch.sessionUsers()[at])) return false;
  }
  return true;
}

bool RtcTable::insertMessages(const StoreBatch& batch, std::span<const std::int64_t> identifiers) {
  if (batch.rtcMessages().empty()) return true;
  batch_ = &batch;
  identifiers_ = identifiers;
  const bool inserted = insertMessages_.run();
  batch_ = nullptr;
  return inserted;
}

void RtcTable::committed() { uncommitted_.clear(); }

std::size_t RtcTable::rowCount() const { return batch_ == nullptr ? 0 : batch_->rtcMessages().size(); }

void RtcTable::read(std::size_t row, int column, SqliteCell& cell) const {
  const StoreBatch::RtcMessage& message = batch_->rtcMessages()[row];
  switch (column) {
    case 0:
      return cell.set(identifiers_[row]);
    case 1:
      return cell.set(message.sentAt);
    case 2:
      return cell.set(batch_->sessions()[message.session]->place.identifier);
    case 3:
      return cell.set(static_cast<std::int64_t>(message.category));
    case 4:
      return cell.set(static_cast<std::int64_t>(message.type));
    case 5:
      return cell.set(batch_->text(message.payload));
    default:
      return cell.setUser(message.user);
  }
}

bool RtcTable::has(const RtcSessionRecord& session) const { return session.place.file == fileNumber_; }

bool RtcTable::insertSession(const std::shared_ptr<RtcSessionRecord>& session, std::uint32_t user) {
  const std::string sessionInfo = json_.compact(session->sessionInfo);
  const std::string userInfo = json_.compact(session->userInfo);
  insertSession_.bind(1, session->startedAt);
  insertSession_.bind(2, sessionInfo);
  insertSession_.bind(3, userInfo);
  insertSession_.bindUser(4, user);
  insertSession_.bindUnlessZero(5, floor_ == 0 ? 0 : floor_ + 1);
  if (!insertSession_.run()) return false;
  floor_ = 0;
  session->place = {database_.insertedRow(), fileNumber_};
  uncommitted_.push_back(session);
  newSessions_.push_back({user, static_cast<std::int64_t>(sessionInfo.size() + userInfo.size())});
  return true;
}

}  // namespace tonewerk
