-- The report store as daemons before version 2 made it, with some rows. make_version1.py makes version1.db of it.
PRAGMA page_size = 8192; PRAGMA auto_vacuum = INCREMENTAL; PRAGMA journal_mode = WAL;
BEGIN;
CREATE TABLE analytics_row (
  id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, name_set INTEGER NOT NULL, payload TEXT NOT NULL);
CREATE TABLE analytics_name (
  name_set INTEGER NOT NULL, position INTEGER NOT NULL, name TEXT NOT NULL,
  PRIMARY KEY (name_set, position)) WITHOUT ROWID;
CREATE INDEX analytics_name_by_name ON analytics_name (name);
CREATE TABLE metric (
  id INTEGER PRIMARY KEY, posted_at REAL NOT NULL, identifier INTEGER NOT NULL, record BLOB NOT NULL);
CREATE TABLE power_event (
  id INTEGER PRIMARY KEY, recorded_at REAL NOT NULL, event_group INTEGER NOT NULL, name TEXT NOT NULL,
  payload TEXT NOT NULL);
CREATE TABLE rtc_session (
  id INTEGER PRIMARY KEY, started_at REAL NOT NULL, session_info TEXT NOT NULL,
  user_info TEXT NOT NULL);
CREATE TABLE rtc_message (
  id INTEGER PRIMARY KEY, sent_at REAL NOT NULL, rtc_session INTEGER NOT NULL,
  category INTEGER NOT NULL, type INTEGER NOT NULL, payload TEXT NOT NULL);
CREATE VIEW analytics_event (id, recorded_at, name, payload) AS
  SELECT r.id * 2 + n.position, r.recorded_at, n.name, r.payload
    FROM analytics_row AS r CROSS JOIN analytics_name AS n ON n.name_set = r.name_set;
INSERT INTO analytics_name VALUES (1, 0, 'first'), (1, 1, 'second'), (2, 0, 'single');
INSERT INTO analytics_row VALUES (10, 1.5, 1, '{"n":1}'), (12, 2.5, 2, '{"n":2}');
INSERT INTO metric VALUES (3, 1.5, 7, x'00ff');
INSERT INTO power_event VALUES (4, 1.5, 28, 'power', '{"p":1}');
INSERT INTO rtc_session VALUES (5, 1.5, '{"s":1}', '{"kLinkReportUserInfoServiceName":"telephony_session"}');
INSERT INTO rtc_message VALUES (10, 1.5, 5, 4, 1, '{"m":1}'), (20, 2.5, 5, 4, 2, '{"m":2}');
PRAGMA user_version = 1;
COMMIT;
