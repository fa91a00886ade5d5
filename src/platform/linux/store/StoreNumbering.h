// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreBatch.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

// Gives identifiers to the analytics rows and the real-time-communication rows of batches, so that in each of
// the views analytics_event and rtc_message they grow in the order of recording. A row that both views show
// has one identifier for both, which is above all earlier ones of either.
//
// Used on the writer's thread, within its transactions. After a transaction was undone, a new object is
// needed.
class StoreNumbering {
 public:
  // `database` outlives it. All identifiers are above those of `floors` (StoreFloors.h).
  StoreNumbering(SqliteDatabase& database, const StoreRowIds& floors)
      : database_(database), floors_(floors) {}

  // Numbers the rows of `batch`. The first call reads the newest identifiers of the file. False on failure.
  // The database then has the problem.
  [[nodiscard]] bool number(const StoreBatch& batch);

  // The identifiers of the last batch's analytics(), and of its rtcMessages().
  std::span<const std::int64_t> analytics() const { return analytics_; }
  std::span<const std::int64_t> rtcMessages() const { return rtcMessages_; }
  // Whether SQLite gives the analytics rows the same identifiers when it is told none, which costs less.
  bool analyticsAreNext() const { return analyticsAreNext_; }

 private:
  [[nodiscard]] bool readNewest();

  SqliteDatabase& database_;
  const StoreRowIds floors_;
  SqliteStatement newestInTable_;
  bool hasRead_ = false;
  std::int64_t newestEvent_ = 0;
  // After opening a file it may be above all identifiers of messages: those are not looked for.
  std::int64_t newestMessage_ = 0;
  std::vector<std::int64_t> analytics_;
  std::vector<std::int64_t> rtcMessages_;
  bool analyticsAreNext_ = false;
};

}  // namespace tonewerk
