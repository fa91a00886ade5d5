# SPDX-License-Identifier: Apache-2.0
"""Makes the page of a store as large as that of a busy month, and prints how long that takes."""

import os
import pathlib
import sqlite3
import subprocess
import sys
import tempfile
import time
import unittest

SOURCE = pathlib.Path(__file__).resolve().parents[3]
PROGRAMS = pathlib.Path(os.environ.get("TONEWERK_PROGRAMS", SOURCE / "build/release/src"))
MOST_BYTES = 3_000_000


class LargePageTest(unittest.TestCase):
    def test_thirty_busy_days_make_a_page_under_three_megabytes(self):
        with tempfile.TemporaryDirectory() as scratch:
            state = pathlib.Path(scratch)
            store = state / "reports.db"
            subprocess.run([sys.executable, "-B", SOURCE / "tests/support/reports/make_demo_store.py", store, "--times", "100"], check=True)
            with sqlite3.connect(store) as database:
                sizes = {table: database.execute(f"SELECT count(*) FROM {table}").fetchone()[0]
                         for table in ("session", "volume_stretch", "issue", "event", "channel_bucket")}
            self.assertGreater(sizes["event"], 150_000)
            environment = {"PATH": os.environ["PATH"], "STATE_DIRECTORY": scratch, "TONEWERK_REPORTING_SOCKET": str(state / "none.sock"),
                           "LSAN_OPTIONS": os.environ.get("LSAN_OPTIONS", "")}
            begin = time.monotonic()
            subprocess.run([PROGRAMS / "twctl", "report", "-o", state / "report.html"], env=environment, check=True)
            seconds = time.monotonic() - begin
            page = (state / "report.html").stat().st_size
            print(f"{sizes}: {page} bytes in {seconds:.2f} s", file=sys.stderr)
            self.assertLess(page, MOST_BYTES)
            self.assertGreater(page, 700_000)  # it has the marks that there is room for


if __name__ == "__main__":
    unittest.main()
