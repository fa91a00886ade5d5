// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <gtest/gtest.h>
#include <string>

#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"

namespace tonewerk {

// Makes a file that has the store's views for people as tables, so that a test can say what is in them.
class ReportViews {
 public:
  explicit ReportViews(const std::string& path) {
    EXPECT_TRUE(database_.open(path, SqliteDatabase::Mode::kReadWrite, std::chrono::seconds(5)));
    run("PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF;"
        "CREATE TABLE session (id INTEGER, reporter_id INTEGER, service TEXT, application TEXT, process "
        "TEXT, "
        "user_id INTEGER, started_at REAL, ended_at REAL, ending TEXT, messages INTEGER, unique_messages "
        "INTEGER, "
        "redundant_messages INTEGER, active_seconds REAL, overloads INTEGER);"
        "CREATE TABLE event (id INTEGER, at REAL, session INTEGER, category TEXT, type TEXT, source TEXT, "
        "payload TEXT);"
        "CREATE TABLE volume_stretch (id INTEGER, session INTEGER, service TEXT, application TEXT, "
        "started_at "
        "REAL, ended_at REAL, seconds REAL, device TEXT, volume REAL, volume_bucket REAL, sample_rate "
        "INTEGER, "
        "channels INTEGER, format TEXT, ringer INTEGER);"
        "CREATE TABLE input_stretch (id INTEGER, session INTEGER, service TEXT, application TEXT, started_at "
        "REAL, ended_at REAL, seconds REAL, device TEXT, mode TEXT, input_port TEXT, vocoders TEXT);"
        "CREATE TABLE gather_stretch (id INTEGER, session INTEGER, service TEXT, application TEXT, "
        "started_at "
        "REAL, ended_at REAL, seconds REAL, device TEXT, sample_rate INTEGER, channels INTEGER, format TEXT);"
        "CREATE TABLE issue (id INTEGER, at REAL, session INTEGER, service TEXT, application TEXT, kind "
        "TEXT, "
        "node TEXT, duration_seconds REAL, buffer_frames INTEGER, io_cycle INTEGER);"
        "CREATE TABLE haptics (id INTEGER, at REAL, application TEXT, name TEXT, seconds REAL, status "
        "INTEGER);"
        "CREATE TABLE channel_value (session INTEGER, at REAL, driver TEXT, group_name TEXT, subgroup TEXT, "
        "name "
        "TEXT, unit TEXT, value INTEGER);"
        "CREATE TABLE channel_bucket (session INTEGER, at REAL, driver TEXT, group_name TEXT, subgroup TEXT, "
        "name "
        "TEXT, unit TEXT, lower INTEGER, upper INTEGER, hits INTEGER);"
        "CREATE TABLE channel_state (session INTEGER, at REAL, driver TEXT, group_name TEXT, subgroup TEXT, "
        "name "
        "TEXT, state TEXT, transitions INTEGER, residency INTEGER, duty_cycle REAL);"
        "PRAGMA user_version = " +
        std::to_string(kStoreSchemaVersion));
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
        std::to_string(volume) + ", " + std::to_string(volume) + ", 48000, 2, 'S32LE', 0)");
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
