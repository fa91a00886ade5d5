#!/usr/bin/env python3
"""Makes version1.db of version1.sql: tests/platform/linux/store/make_version1.py. The file is kept as it is, so that the tests
read what an earlier SQLite has written. Its pages are smaller than a daemon's, which makes the file smaller."""

import pathlib
import sqlite3

FOLDER = pathlib.Path(__file__).resolve().parent
PAGE_BYTES = 2048

path = FOLDER / "version1.db"
path.unlink(missing_ok=True)
database = sqlite3.connect(path, isolation_level=None)
database.execute(f"PRAGMA page_size = {PAGE_BYTES}")
database.executescript((FOLDER / "version1.sql").read_text().replace("PRAGMA page_size = 8192;", ""))
database.close()
