// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/RtcTable.h"

#include <string>

#include "platform/JsonService.h"

namespace tonewerk {

RtcTable::RtcTable(SqliteDatabase& database, const JsonService& json, std::uint64_t fileNumber)
    : database_(database),
      json_(json),
      fileNumber_(fileNumber),
      insertSession_(database.prepare(
          "INSERT INTO rtc_session (started_at, session_info, user_info) VALUES (?1, ?2, ?3)")),
      insertMessage_(
          database.prepare("INSERT INTO rtc_message (sent_at, rtc_session, category, type, payload)"
                           " VALUES (?1, ?2, ?3, ?4, ?5)")) {}

RtcTable::~RtcTable() {
  for (const auto& session : uncommitted_) session->place = {};
}

bool RtcTable::insert(const RtcSessionRow& row) { return has(*row.session) || insertSession(row.session); }

bool RtcTable::insert(const RtcMessageRow& row) {
  if (!has(*row.session) && !insertSession(row.session)) return false;
  const std::string payload = json_.compact(row.payload);
  insertMessage_.bind(1, row.sentAt);
  insertMessage_.bind(2, row.session->place.identifier);
  insertMessage_.bind(3, static_cast<std::int64_t>(row.category));
  insertMessage_.bind(4, static_cast<std::int64_t>(row.type));
  insertMessage_.bind(5, payload);
  return insertMessage_.run();
}

void RtcTable::committed() { uncommitted_.clear(); }

bool RtcTable::has(const RtcSessionRecord& session) const { return session.place.file == fileNumber_; }

bool RtcTable::insertSession(const std::shared_ptr<RtcSessionRecord>& session) {
  const std::string sessionInfo = json_.compact(session->sessionInfo);
  const std::string userInfo = json_.compact(session->userInfo);
  insertSession_.bind(1, session->startedAt);
  insertSession_.bind(2, sessionInfo);
  insertSession_.bind(3, userInfo);
  if (!insertSession_.run()) return false;
  const auto identifier = database_.number("SELECT last_insert_rowid()");
  if (!identifier) return false;
  session->place = {*identifier, fileNumber_};
  uncommitted_.push_back(session);
  return true;
}

}  // namespace tonewerk
