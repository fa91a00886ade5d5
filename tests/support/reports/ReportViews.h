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

  // What a glitch says; a text is null when it is empty, and a number when it is below 0.
  struct Glitch {
    int event = 1;
    int session = 1;
    double at = 0.0;
    std::string id;
    std::string cause = "late";
    std::string firstCause = "late";
    std::string application;  // the culprit's
    std::string process;
    std::string node = "filter";  // the culprit's
    std::string device = "speaker";
    std::string chain;
    std::string reason;
    std::string cycles;
    double over = 3.0;
    double lost = 5.0;
    int overloads = 1;
  };

  // An overload that nobody has judged.
  static Glitch unjudged(int event, int session, double at) {
    return {.event = event,
            .session = session,
            .at = at,
            .id = "",
            .cause = "",
            .firstCause = "",
            .node = "",
            .device = "",
            .over = -1.0,
            .lost = -1.0};
  }

  // A glitch of a session that is there.
  void glitched(const Glitch& glitch) {
    const auto number = [](double value) { return value < 0.0 ? "NULL" : std::to_string(value); };
    const std::string at = std::to_string(glitch.at);
    run("INSERT INTO glitch SELECT " + std::to_string(glitch.event) + ", " + at + ", " + at + ", " +
        text(glitch.id) + ", id, service, application, " + text(glitch.cause) + ", " +
        text(glitch.firstCause) + ", 0.9, " + text(glitch.application) + ", " + text(glitch.process) + ", " +
        (glitch.process.empty() ? "NULL" : "4711") + ", " + text(glitch.node) + ", 'player', " +
        text(glitch.device) + ", " + text(glitch.chain) + ", " + number(glitch.over) + ", 5.3, 256, 48000, " +
        number(glitch.lost) + ", " + std::to_string(glitch.overloads) + ", " + text(glitch.reason) + ", " +
        text(glitch.cycles) + " FROM session WHERE id = " + std::to_string(glitch.session));
  }

 private:
  static std::string text(const std::string& value) {
    std::string quoted = "'";
    for (const char letter : value) quoted.append(letter == '\'' ? 2 : 1, letter);
    return value.empty() ? "NULL" : quoted + "'";
  }

  SqliteDatabase database_;
};

}  // namespace tonewerk
