// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreSchema.h"

#include "platform/linux/store/StoreViews.h"

namespace tonewerk {
namespace {

// The tables have few indexes, so that a commit of a single message writes a single page. An index on time
// would cost a second page and AUTOINCREMENT a third. Instead of AUTOINCREMENT, the row with the highest
// identifier is never deleted, so that identifiers only grow: see StoreTrimmer.
constexpr std::string_view kTables = R"(
  CREATE TABLE analytics_row (
    id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, name_set INTEGER NOT NULL, payload TEXT NOT NULL,
    rtc_session INTEGER, rtc_bits INTEGER, user_id INTEGER, session INTEGER, began_at REAL, ended_at REAL);
  CREATE TABLE analytics_name (
    name_set INTEGER NOT NULL, position INTEGER NOT NULL, name TEXT NOT NULL,
    category TEXT, type TEXT, source TEXT,
    PRIMARY KEY (name_set, position)) WITHOUT ROWID;
  CREATE INDEX analytics_name_by_name ON analytics_name (name);
  CREATE TABLE metric (
    id INTEGER PRIMARY KEY, posted_at REAL NOT NULL, identifier INTEGER NOT NULL, record BLOB NOT NULL,
    user_id INTEGER);
  CREATE TABLE power_event (
    id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, event_group INTEGER NOT NULL, name TEXT NOT NULL,
    payload TEXT NOT NULL, user_id INTEGER);
  CREATE TABLE rtc_session (
    id INTEGER PRIMARY KEY, started_at REAL NOT NULL, session_info TEXT NOT NULL,
    user_info TEXT NOT NULL, user_id INTEGER);
  CREATE TABLE rtc_row (
    id INTEGER PRIMARY KEY, sent_at REAL NOT NULL, rtc_session INTEGER NOT NULL,
    category INTEGER NOT NULL, type INTEGER NOT NULL, payload TEXT NOT NULL,
    user_id INTEGER);
)";

// The lives of sessions. Their rows are written at the start, with each change of the configuration and at
// the end, not with each message.
constexpr std::string_view kSessionTable = R"(
  CREATE TABLE session_row (
    id INTEGER PRIMARY KEY, started_at REAL NOT NULL, request INTEGER, reporter_id INTEGER NOT NULL,
    service TEXT, application TEXT, process TEXT, ended_at REAL, ending TEXT, messages INTEGER,
    redundant_messages INTEGER, active_seconds REAL, overloads INTEGER, user_id INTEGER);
)";

// What was sent to endpoints in the network: one row a request. It is the last of the tables and views, as in
// a file that gets it later.
constexpr std::string_view kSendingTable = R"(
  CREATE TABLE sending_row (
    id INTEGER PRIMARY KEY, sent_at REAL NOT NULL, endpoint TEXT NOT NULL, signal TEXT NOT NULL,
    records INTEGER NOT NULL, bytes INTEGER NOT NULL, first_event INTEGER, last_event INTEGER,
    status INTEGER, outcome TEXT NOT NULL, rejected INTEGER, problem TEXT, user_id INTEGER);
)";

// Only summaries are in it, so a message costs nothing.
constexpr std::string_view kStretchIndex =
    "CREATE INDEX analytics_row_by_stretch ON analytics_row (began_at) WHERE began_at IS NOT NULL;";

// How old the rows are: see StoreAge. A mark names the newest row of each table.
constexpr std::string_view kAgeTables = R"(
  CREATE TABLE age_mark (
    id INTEGER PRIMARY KEY, age REAL NOT NULL, time_off REAL NOT NULL,
    analytics_row INTEGER NOT NULL, metric INTEGER NOT NULL, power_event INTEGER NOT NULL,
    rtc_session INTEGER NOT NULL, rtc_row INTEGER NOT NULL, session_row INTEGER NOT NULL DEFAULT 0,
    sending_row INTEGER NOT NULL DEFAULT 0);
  CREATE TABLE age_clock (
    id INTEGER PRIMARY KEY, age REAL NOT NULL, wall REAL NOT NULL, uptime REAL NOT NULL);
)";

// CROSS JOIN keeps the rows outermost. So events come in the order of their identifiers and are not sorted.
constexpr std::string_view kAnalyticsView = R"(
  CREATE VIEW analytics_event (id, recorded_at, name, payload) AS
    SELECT r.id * 2 + n.position, r.recorded_at, n.name, r.payload
      FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set;
)";
static_assert(kStoreNamesPerRow == 2, "the view says 2");

// Both parts are read by key and merged, so that messages in the order of their identifiers are not sorted.
// The hidden part is counted in bytes: in a text substr() would count characters, from the beginning. The
// casts give the columns of both parts the same affinity, without which SQLite would not merge.
constexpr std::string_view kRtcView = R"(
  CREATE VIEW rtc_message (id, sent_at, rtc_session, category, type, payload) AS
    SELECT id, sent_at, rtc_session, category, type, payload FROM rtc_row
    UNION ALL
    SELECT id, recorded_at, rtc_session, CAST(rtc_bits >> 16 & 65535 AS INTEGER),
           CAST(rtc_bits & 65535 AS INTEGER),
           CAST(CASE WHEN rtc_bits >> 32 = 0 THEN payload
                     ELSE substr(CAST(payload AS BLOB), 1, rtc_bits >> 40) ||
                          substr(CAST(payload AS BLOB), (rtc_bits >> 40) + (rtc_bits >> 32 & 255) + 1)
                     END AS TEXT)
      FROM analytics_row WHERE rtc_session IS NOT NULL;
)";

constexpr std::string_view kFromVersion1 = R"(
  ALTER TABLE analytics_row ADD COLUMN rtc_session INTEGER;
  ALTER TABLE analytics_row ADD COLUMN rtc_bits INTEGER;
  ALTER TABLE rtc_message RENAME TO rtc_row;
)";

constexpr std::string_view kUserColumns = R"(
  ALTER TABLE analytics_row ADD COLUMN user_id INTEGER;
  ALTER TABLE metric ADD COLUMN user_id INTEGER;
  ALTER TABLE power_event ADD COLUMN user_id INTEGER;
  ALTER TABLE rtc_session ADD COLUMN user_id INTEGER;
  ALTER TABLE rtc_row ADD COLUMN user_id INTEGER;
)";

// Who has made a message is not known.
constexpr std::string_view kFromVersion2 = R"(
  ALTER TABLE analytics_row ADD COLUMN session INTEGER;
  ALTER TABLE analytics_row ADD COLUMN began_at REAL;
  ALTER TABLE analytics_row ADD COLUMN ended_at REAL;
  ALTER TABLE analytics_name ADD COLUMN category TEXT;
  ALTER TABLE analytics_name ADD COLUMN type TEXT;
  ALTER TABLE analytics_name ADD COLUMN source TEXT;
)";

constexpr std::string_view kKindsOfNames = R"(
  UPDATE analytics_name SET category = substr(name, 21, instr(substr(name, 21), '.') - 1),
                            type = substr(name, 21 + instr(substr(name, 21), '.'))
    WHERE position = 0 AND category IS NULL AND name GLOB 'com.orvane.tonewerk.*.*' AND
          name NOT GLOB 'com.orvane.tonewerk.*.*.*';
)";

constexpr std::string_view kAgeOfSessions =
    "ALTER TABLE age_mark ADD COLUMN session_row INTEGER NOT NULL DEFAULT 0;";

constexpr std::string_view kAgeOfSendings =
    "ALTER TABLE age_mark ADD COLUMN sending_row INTEGER NOT NULL DEFAULT 0;";

std::string inTransaction(const std::string& sql) {
  return "BEGIN IMMEDIATE;" + sql + "PRAGMA user_version = " + std::to_string(kStoreSchemaVersion) +
         "; COMMIT;";
}

}  // namespace

// Pages of 8 KiB are cheaper to fill than smaller ones, and a commit of a single message still writes one
// page only.
std::string storeFileSettings() { return "PRAGMA page_size = 8192; PRAGMA auto_vacuum = INCREMENTAL;"; }

std::string storeSchema() {
  std::string sql(kTables);
  sql += kSessionTable;
  sql += kStretchIndex;
  sql += kAgeTables;
  sql += kAnalyticsView;
  sql += kRtcView;
  sql += storeViewsSql();
  sql += kSendingTable;
  return inTransaction(sql);
}

std::string storeKindsOfNames() { return std::string(kKindsOfNames); }

std::string storeSendingsMigration() {
  return inTransaction(std::string(kSendingTable).append(kAgeOfSendings));
}

std::string storeMigration(const EarlierStore& store) {
  std::string sql;
  if (store.version == 1) sql.append(kFromVersion1).append(kRtcView);
  if (!store.hasUsers) sql += kUserColumns;
  sql += kFromVersion2;
  sql += kKindsOfNames;
  sql += kSessionTable;
  sql += kStretchIndex;
  sql += store.hasAges ? std::string(kAgeOfSessions).append(kAgeOfSendings) : std::string(kAgeTables);
  sql += storeViewsSql();
  sql += kSendingTable;
  return inTransaction(sql);
}

}  // namespace tonewerk
