// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"

namespace tonewerk {

class JsonService;

// The real-time-communication sessions and messages in an open report store. The writer's thread, within its
// transactions. Not to be used again after a transaction was undone.
//
// A message whose session is not in the file, because the session's own row was dropped or a new file begun,
// brings the session's row with it.
class RtcTable {
 public:
  // Both outlive it. `fileNumber` tells this file from those that the process wrote before. Prepares its
  // statements; whether that went well shows in the first insert().
  RtcTable(SqliteDatabase& database, const JsonService& json, std::uint64_t fileNumber);
  RtcTable(const RtcTable&) = delete;
  RtcTable& operator=(const RtcTable&) = delete;
  // Sessions that were not committed have no place again.
  ~RtcTable();

  // False on failure; the database says which.
  [[nodiscard]] bool insert(const RtcSessionRow& row);
  [[nodiscard]] bool insert(const RtcMessageRow& row);
  // What was inserted is in the file.
  void committed();

 private:
  bool has(const RtcSessionRecord& session) const;
  [[nodiscard]] bool insertSession(const std::shared_ptr<RtcSessionRecord>& session);

  SqliteDatabase& database_;
  const JsonService& json_;
  const std::uint64_t fileNumber_;
  SqliteStatement insertSession_;
  SqliteStatement insertMessage_;
  std::vector<std::shared_ptr<RtcSessionRecord>> uncommitted_;
};

}  // namespace tonewerk
