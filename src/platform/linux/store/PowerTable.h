// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"

namespace tonewerk {

class JsonService;

// The power events in an open report store. The writer's thread, within its transactions.
class PowerTable {
 public:
  // Both outlive it. Prepares its statement; whether that went well shows in the first insert().
  PowerTable(SqliteDatabase& database, const JsonService& json);

  // False on failure; the database says which.
  [[nodiscard]] bool insert(const PowerRow& row);

 private:
  const JsonService& json_;
  SqliteStatement insertRow_;
};

}  // namespace tonewerk
