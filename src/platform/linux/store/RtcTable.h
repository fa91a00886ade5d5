// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/SqliteRows.h"
#include "platform/linux/store/StoreBatch.h"

namespace tonewerk {

class JsonService;

// Writes the real-time-communication sessions and messages into an open report store. Used on the writer's
// thread, within its transactions. After a transaction was undone, a new object is needed.
//
// When the file lacks a message's session, the session's row is written before the message's. That happens
// when the session's own row was dropped, or when a new file was begun after it.
class RtcTable final : private SqliteRows {
 public:
  // `database` and `json` outlive it. `fileNumber` distinguishes this file from those that the process wrote
  // before. The first session is numbered above `floor`. Prepares its statements. Whether that succeeded
  // shows in the first insert().
  RtcTable(SqliteDatabase& database, const JsonService& json, std::uint64_t fileNumber,
           std::int64_t floor = 0);
  RtcTable(const RtcTable&) = delete;
  RtcTable& operator=(const RtcTable&) = delete;
  // Takes back the place of sessions that were not committed.
  ~RtcTable() override;

  // Inserts the batch's sessions, those of shared rows included. False on failure. The database then has the
  // problem.
  [[nodiscard]] bool insertSessions(const StoreBatch& batch);
  // Inserts the messages that have a row of their own, under these identifiers, after their sessions.
  [[nodiscard]] bool insertMessages(const StoreBatch& batch, std::span<const std::int64_t> identifiers);
  // A session that the last insertSessions() has inserted, with the bytes of its texts.
  struct NewSession {
    std::uint32_t user = 0;
    std::int64_t bytes = 0;
  };
  std::span<const NewSession> newSessions() const { return newSessions_; }
  // The inserted rows are in the file.
  void committed();

 private:
  std::size_t rowCount() const override;
  void read(std::size_t row, int column, SqliteCell& cell) const override;
  bool has(const RtcSessionRecord& session) const;
  [[nodiscard]] bool insertSession(const std::shared_ptr<RtcSessionRecord>& session, std::uint32_t user);

  SqliteDatabase& database_;
  const JsonService& json_;
  const std::uint64_t fileNumber_;
  std::int64_t floor_;  // 0 when the rows in the table say it
  SqliteStatement insertSession_;
  SqliteStatement insertMessages_;
  const StoreBatch* batch_ = nullptr;          // while its messages are inserted
  std::span<const std::int64_t> identifiers_;  // of its messages
  std::vector<std::shared_ptr<RtcSessionRecord>> uncommitted_;
  std::vector<NewSession> newSessions_;
};

}  // namespace tonewerk
