// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <string>

#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {

// A store's file, made by SQL. Queries see no difference between its tables and the views of a real store.
class StoreFixture {
 public:
  StoreFixture() {
    std::filesystem::create_directory(state());
    run("PRAGMA user_version = " + std::to_string(kStoreSchemaVersion));
  }

  void run(const std::string& sql) const {
    sqlite3* database = nullptr;
    ASSERT_EQ(sqlite3_open(file().c_str(), &database), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(database, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(database);
    sqlite3_close(database);
  }
  std::string state() const { return directory_.path("state"); }
  std::string file() const { return state() + "/" + std::string(kStoreFileName); }

 private:
  TemporaryDirectory directory_;
};

}  // namespace tonewerk
