# SPDX-License-Identifier: Apache-2.0
"""Makes a store for the queries of the pages: tables with the names and columns of the store's views, and a few rows in each."""

import sqlite3
import sys
import time

from programs import SOURCE

sys.path.insert(0, str(SOURCE / "tests/support/reports"))
from store_views import columns, schema_version  # pylint: disable=wrong-import-position

COLUMNS = columns()


def rows(hour):
    """The rows of each table, in the order of its columns. Everything is in the hour that begins at `hour`, but for the last
    session and its stretch, which are ten days older."""
    old = hour - 10 * 86400
    player, phone = ("longformaudio", "com.example.player"), ("telephony", "com.example.phone")
    return {
        "session": [
            (1, 77, *player, "player", 1000, old, old + 60, "stopped", 10, 8, 2, 60, 0),
            (2, 77, *player, "player", 1000, hour, hour + 300, "stopped", 30, 20, 10, 240, 2),
            (3, 78, *phone, "phone", 1000, hour + 60, hour + 120, "interrupted", 10, 10, 0, 30, 1),
            (4, 79, *phone, "phone", 1000, hour + 200, None, None, None, None, None, None, None),
        ],
        "event": [
            (1, hour, 2, "Volume", "Generic", "client", '{"QMSessionVolume":0.5}'),
            (2, hour + 1, 2, "Volume", "Generic", "client", '{"QMSessionVolume":0.5,"more":"text, with \\"quotes\\""}'),
            (3, hour + 300, 2, "Volume", "Summary", "derived", '{"play_seconds":240.0}'),
            (4, hour + 200, 4, "Playback", "Start", "client", "{}"),
        ],
        "volume_stretch": [
            (1, 1, *player, old, old + 60, 60.0, "Speaker", 1.0, 1.0, 48000, 2, "float", 0, 0),
            (2, 2, *player, hour, hour + 120, 120.0, "Speaker", 0.5, 0.5, 48000, 2, "float", 0, 0),
            (3, 2, *player, hour + 120, hour + 240, 120.0, "Headphones", 0.25, 0.25, 48000, 2, "float", 0, 0),
            (4, 3, *phone, hour + 60, hour + 90, 30.0, "Receiver", 0.75, 0.75, 16000, 1, "int16", 1, 0),
            (5, 3, *phone, hour + 90, hour + 100, 10.0, None, None, None, None, None, None, None, None),
        ],
        "input_stretch": [(1, 3, *phone, hour + 60, hour + 96, 36.0, "Microphone", "chat", "front", "AMR")],
        "gather_stretch": [(1, 3, *phone, hour + 60, hour + 80, 20.0, "Speaker", 48000, 2, "float")],
        "issue": [
            (1, hour + 5, 2, *player, "overload", "out", 0.25, 128, 7),
            (2, hour + 6, 2, *player, "overload", "out", 0.75, 128, 8),
            (3, hour + 70, 3, *phone, "overload", "out", 0.1, 256, 9),
            (4, hour + 80, 3, *phone, "silence", None, 2.0, None, None),
        ],
        "glitch": [
            (1, hour + 5, hour + 4.99, f"{int(hour * 1000) + 4990}-7", 2, *player, "late", "late", 0.9, "com.example.player", "player", 4711,
             "player", "player", "speaker", None, 1.5, 2.7, 128, 48000, 2.7, 1, "player took 4.2 ms of 2.7 ms.", None),
            (2, hour + 6, hour + 5.99, f"{int(hour * 1000) + 5990}-8", 2, *player, "waiting for another", "late", 0.8, "com.example.filter",
             "filter", 4712, "filter", "player", "speaker", "filter > player > speaker", 2.0, 2.7, 128, 48000, 2.7, 3,
             "filter took 4.7 ms of 2.7 ms.", "[]"),
            (3, hour + 70, None, None, 3, *phone, *(None,) * 15, 1, None, None),
        ],
        "haptics": [
            (1, hour + 1, "com.example.keyboard", "EngineOnDuration", 0.125, None),
            (2, hour + 2, "com.example.keyboard", "EngineOnDuration", 0.25, None),
            (3, hour + 3, None, "LeakedHapticsSessionInfo", 1.0, None),
        ],
        "channel_value": [
            (2, hour + 300, "amp", "Tx", "left", "underruns", None, 3),
            (3, hour + 120, "amp", "Tx", "left", "underruns", None, 4),
        ],
        "channel_bucket": [
            (2, hour + 300, "amp", "Tx", "left", "latency", "ms", 0, 10, 6),
            (2, hour + 300, "amp", "Tx", "left", "latency", "ms", 10, 100, 1),
            (3, hour + 120, "amp", "Tx", "left", "latency", "ms", 10, 100, 1),
        ],
        "channel_state": [
            (2, hour + 300, "amp", "Tx", "left", "power", "on", 2, 200, 0.5),
            (3, hour + 120, "amp", "Tx", "left", "power", "on", 1, 100, 0.25),
        ],
        "ledger": [
            (1, hour + 10, "http://localhost:4318/v1/logs", "logs", 2, 400, None, None, None, "kept", None, "Couldn't connect to server"),
            (2, hour + 16, "http://localhost:4318/v1/logs", "logs", 2, 400, None, None, 200, "delivered", 0, None),
        ],
    }


def begin_of_last_hour():
    return float(int(time.time()) // 3600 * 3600 - 3600)


def make_store(path, hour):
    with sqlite3.connect(path) as store:
        store.execute(f"PRAGMA user_version = {schema_version()}")
        for table, named in COLUMNS.items():
            store.execute(f"CREATE TABLE {table} ({named})")
            for row in rows(hour)[table]:
                store.execute(f"INSERT INTO {table} VALUES ({', '.join('?' * len(row))})", row)
    store.close()
