// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <gtest/gtest.h>
#include <string>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"
#include "platform/linux/store/StoreViews.h"

namespace tonewerk {

// Makes a file that has the store's views for people as tables, so that a test can say what is in them.
class ReportViews {
 public:
  explicit ReportViews(const std::string& path) {
    EXPECT_TRUE(database_.open(path, SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(5)));
    std::string tables;
    for (const StoreView& view : storeViews()) {
      std::string columns;
      for (const StoreViewColumn& column : view.columns) {
        columns.append(columns.empty() ? "" : ", ").append(column.name).append(" ").append(column.type);
      }
      tables.append("CREATE TABLE ").append(view.name).append(" (").append(columns).append(");");
    }
    run("PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF;" + tables +
        "PRAGMA user_version = " + std::to_string(kStoreSchemaVersion));
  }

  void run(const std::string& sql) { EXPECT_TRUE(database_.run(sql)) << database_.problem(); }

  // A session that played on one device, from `started` for `seconds`.
  void played(int session, const std::string& application, double started, double seconds,
              const std::string& device, double volume) {
    const std::string id = std::to_string(session);
    const std::string from = std::to_string(started);
    const std::string until = std::to_string(started + seconds);
    run("INSERT INTO session VALUES (" + id + ", 1000 + " + id + ", 'longformaudio', '" + application +
        "', 'player', 1000, " + from + ", " + until + ", 'stopped', 10, 8, 2, " + std::to_string(seconds) +
        ", 0); INSERT INTO volume_stretch VALUES (" + id + ", " + id + ", 'longformaudio', '" + application +
        "', " + from + ", " + until + ", " + std::to_string(seconds) + ", '" + device + "', " +
        std::to_string(volume) + ", " + std::to_string(volume) + ", 48000, 2, 'S32LE', 0, 0)");
  }

  void overloaded(int session, double at, int frames) {
    run("INSERT INTO issue SELECT 1, " + std::to_string(at) + ", " + std::to_string(session) +
        ", service, application, 'overload', 'mixer', 0.5, " + std::to_string(frames) +
        ", 1 FROM session WHERE id = " + std::to_string(session));
  }

 private:
  SqliteDatabase database_;
};

}  // namespace tonewerk
